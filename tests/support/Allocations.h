#pragma once

#include <atomic>

#include <windows.h>
#include <sqlite3.h>

namespace tavi::test {

enum class Heap { c, zeroed, sqlite };

// During its lifetime `failing` allocations of its thread from one heap, of at least `smallest` bytes each, fail after
// `succeeding` ones that succeed. The C heap serves operator new, too; `zeroed` is its calloc.
class FailingAllocations {
  public:
    explicit FailingAllocations(int succeeding, Heap heap = Heap::c, int failing = 1 << 30, std::size_t smallest = 0)
    {
        heap_ = heap;
        smallest_ = smallest;
        left_ = succeeding;
        failing_ = failing;
        thread_ = GetCurrentThreadId();
    }
    ~FailingAllocations()
    {
        thread_ = 0;
    }
    static bool fails(Heap heap, std::size_t size)
    {
        return thread_ == GetCurrentThreadId() && heap_ == heap && size >= smallest_ && left_-- <= 0 && failing_-- > 0;
    }
    // Calls a function whose allocations do not fail.
    template <class Call>
    static void* exempt(Call call)
    {
        DWORD own = GetCurrentThreadId();
        const bool pauses = thread_.compare_exchange_strong(own, 0);
        void* const block = call();
        if (pauses)
            thread_ = own;
        return block;
    }

  private:
    static inline std::atomic<DWORD> thread_{0};
    static inline Heap heap_{};
    static inline std::size_t smallest_ = 0;
    static inline int left_ = 0, failing_ = 0;
    static inline sqlite3_mem_methods real_;
    // SQLite accepts other methods only before its first use. Without lookaside they allocate small blocks too.
    static inline const bool installed_ = [] {
        sqlite3_config(SQLITE_CONFIG_GETMALLOC, &real_);
        sqlite3_mem_methods methods = real_;
        methods.xMalloc = [](int size) {
            return fails(Heap::sqlite, static_cast<std::size_t>(size)) ? nullptr
                                                                       : exempt([&] { return real_.xMalloc(size); });
        };
        methods.xRealloc = [](void* block, int size) {
            return fails(Heap::sqlite, static_cast<std::size_t>(size))
                       ? nullptr
                       : exempt([&] { return real_.xRealloc(block, size); });
        };
        sqlite3_config(SQLITE_CONFIG_MALLOC, &methods);
        return sqlite3_config(SQLITE_CONFIG_LOOKASIDE, 0, 0) == SQLITE_OK;
    }();
};

} // namespace tavi::test
