#pragma once

#include <sqlite3.h>

namespace tavi::test {

// While it lives, `failing` allocations of SQLite fail once `succeeding` have succeeded. For one thread that uses
// SQLite.
class TestHeap {
  public:
    explicit TestHeap(int succeeding, int failing = 1 << 30)
    {
        left_ = succeeding;
        failing_ = failing;
    }
    ~TestHeap()
    {
        failing_ = 0;
    }

  private:
    static bool fails()
    {
        return failing_ > 0 && left_-- <= 0 && failing_-- > 0;
    }
    static inline int left_ = 0, failing_ = 0;
    static inline sqlite3_mem_methods real_;
    // SQLite takes other methods only before its first use. Without lookaside small blocks come from them too.
    static inline const bool installed_ = [] {
        sqlite3_config(SQLITE_CONFIG_GETMALLOC, &real_);
        sqlite3_mem_methods methods = real_;
        methods.xMalloc = [](int size) { return fails() ? nullptr : real_.xMalloc(size); };
        methods.xRealloc = [](void* block, int size) { return fails() ? nullptr : real_.xRealloc(block, size); };
        sqlite3_config(SQLITE_CONFIG_MALLOC, &methods);
        return sqlite3_config(SQLITE_CONFIG_LOOKASIDE, 0, 0) == SQLITE_OK;
    }();
};

// Takes the place of the database library's file system for as long as it lives: waiting costs no time, and the disk
// can be full.
class TestDisk {
  public:
    TestDisk()
    {
        vfs_.zName = "test";
        vfs_.xSleep = [](sqlite3_vfs*, int microseconds) {
            waited() += microseconds;
            return microseconds;
        };
        vfs_.xOpen = [](sqlite3_vfs* vfs, const char* name, sqlite3_file* file, int flags, int* outFlags) {
            const int result = real()->xOpen(vfs, name, file, flags, outFlags);
            if (result == SQLITE_OK) {
                static sqlite3_io_methods methods;
                static decltype(methods.xWrite) write;
                methods = *file->pMethods;
                write = methods.xWrite;
                methods.xWrite = [](sqlite3_file* to, const void* bytes, int length, sqlite3_int64 offset) {
                    return writesLeft()-- > 0 ? write(to, bytes, length, offset) : SQLITE_FULL;
                };
                file->pMethods = &methods;
            }
            return result;
        };
        sqlite3_vfs_register(&vfs_, 1);
        waited() = 0;
        writesLeft() = 1000;
    }
    TestDisk(const TestDisk&) = delete;
    TestDisk& operator=(const TestDisk&) = delete;
    ~TestDisk()
    {
        sqlite3_vfs_unregister(&vfs_);
    }
    // Microseconds waited for locks.
    static int& waited()
    {
        static int sum;
        return sum;
    }
    static int& writesLeft()
    {
        static int left;
        return left;
    }

  private:
    static sqlite3_vfs* real()
    {
        static sqlite3_vfs* const found = sqlite3_vfs_find(nullptr);
        return found;
    }

    sqlite3_vfs vfs_ = *real();
};

} // namespace tavi::test
