#pragma once

#include <windows.h>

namespace tavi {

// A lock for std::lock_guard. The mutex of the C++ runtime never frees the semaphore that it creates when threads
// contend.
class CriticalSection {
  public:
    CriticalSection() noexcept
    {
        InitializeCriticalSection(&section_);
    }
    CriticalSection(const CriticalSection&) = delete;
    CriticalSection& operator=(const CriticalSection&) = delete;
    ~CriticalSection()
    {
        DeleteCriticalSection(&section_);
    }
    void lock() noexcept
    {
        EnterCriticalSection(&section_);
    }
    bool try_lock() noexcept
    {
        return TryEnterCriticalSection(&section_) != FALSE;
    }
    void unlock() noexcept
    {
        LeaveCriticalSection(&section_);
    }

  private:
    CRITICAL_SECTION section_;
};

} // namespace tavi
