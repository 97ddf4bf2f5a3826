#pragma once

#include <sqlite3.h>

namespace tavi::test {

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
