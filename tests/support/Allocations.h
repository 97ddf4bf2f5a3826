#pragma once

#include <atomic>

#include <windows.h>

namespace tavi::test {

// While it lives, operator new throws in its thread once `succeeding` allocations have succeeded. The operators are in
// GraylistTest.cpp.
struct FailingAllocations {
    explicit FailingAllocations(int succeeding)
    {
        left = succeeding;
        thread = GetCurrentThreadId();
    }
    ~FailingAllocations()
    {
        thread = 0;
    }
    static inline std::atomic<DWORD> thread{0};
    static inline std::atomic<int> left{0};
    // Becomes null as operator delete frees it.
    static inline std::atomic<const void*> watched{nullptr};
};

} // namespace tavi::test
