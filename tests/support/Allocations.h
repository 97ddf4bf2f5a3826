#pragma once

#include <atomic>

#include <windows.h>
#include <sqlite3.h>

namespace tavi::test {

enum class Heap { c, sqlite };

// During its lifetime `failing` allocations of its thread from one heap fail, after `succeeding` ones that succeed. The
// C heap serves operator new, too.
class FailingAllocations {
  public:
    explicit FailingAllocations(int succeeding, Heap heap = Heap::c, int failing = 1 << 30)
    {
        heap_ = heap;
        left_ = succeeding;
        failing_ = failing;
        thread = GetCurrentThreadId();
    }
    ~FailingAllocations()
    {
        thread = 0;
    }
    static bool fails(Heap heap)
    {
        return thread == GetCurrentThreadId() && heap_ == heap && left_-- <= 0 && failing_-- > 0;
    }
    // The heap sets it to null when this block is freed.
    static inline std::atomic<const void*> watched{nullptr};
    static inline std::atomic<DWORD> thread{0};

  private:
    static inline Heap heap_{};
    static inline int left_ = 0, failing_ = 0;
    static inline sqlite3_mem_methods real_;
    // SQLite accepts other methods only before its first use. Without lookaside they allocate small blocks too.
    static inline const bool installed_ = [] {
        sqlite3_config(SQLITE_CONFIG_GETMALLOC, &real_);
        sqlite3_mem_methods methods = real_;
        methods.xMalloc = [](int size) { return fails(Heap::sqlite) ? nullptr : real_.xMalloc(size); };
        methods.xRealloc = [](void* block, int size) {
            return fails(Heap::sqlite) ? nullptr : real_.xRealloc(block, size);
        };
        sqlite3_config(SQLITE_CONFIG_MALLOC, &methods);
        return sqlite3_config(SQLITE_CONFIG_LOOKASIDE, 0, 0) == SQLITE_OK;
    }();
};

} // namespace tavi::test
