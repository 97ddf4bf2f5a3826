#include "statedb/RestoreRequest.h"

#include <ctime>
#include <thread>

#include <gtest/gtest.h>

#include "tests/backupset/ManifestSupport.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"
#include "tests/support/TestDisk.h"

namespace tavi {
namespace {

class RestoreRequests : public testing::Test {
  protected:
    RestoreRequests()
    {
        database_.open(service_.file(L"tavistate.dat"));
        database_.execDML("CREATE TABLE restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT, "
                          "encryption_key TEXT);"
                          "CREATE TABLE restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                          "attributes, target_path, overwrite)");
    }
    // Returns what was logged.
    std::string perform(const wchar_t* selected)
    {
        RestoreRequest request;
        request.selectedPaths.insert(selected);
        request.cutoffTime = 100;
        request.overwrite = true;
        performRestore(request, *manifest_);
        EXPECT_TRUE(request.selectedPaths.empty());
        std::string logged;
        for (const std::string& line : log_.take())
            logged += line;
        return logged;
    }
    int count(const char* sql)
    {
        DbQuery rows = database_.execQuery(sql);
        return rows.nextRow() ? rows.fieldInt(0, -1) : -2;
    }

    test::LogCapture log_;
    test::InstalledService service_;
    DbConnection database_;
    const ManifestRef manifest_ = test::held(
        Manifest::Parse(L"FILES\nC:\\one\\a.txt\n100:1:4000000000:5:0:x:0:40\n\nC:\\one\\b.txt\n100:1:2:6:0:x:0:41\n\n"
                        L"C:\\gone\\c\n100:1:2:6:0:x:0:41"));
};

TEST_F(RestoreRequests, StandInTheDatabaseAsOneTransaction)
{
    const auto start = static_cast<int>(std::time(nullptr));
    EXPECT_EQ(perform(L"C:\\one"), "");
    EXPECT_EQ(perform(L"C:\\nothing there"), "");
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 2); // one without files is stored as well
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE restore_id=1"), 2);
    EXPECT_GE(count("SELECT min(request_time) FROM restores"), start); // the time of writing, not of the version
    EXPECT_EQ(count("SELECT count(*) FROM restores WHERE machine_id='' AND machine_alias='' AND encryption_key=''"), 2);
    // Times are bound as signed 32-bit numbers, attributes are octal in the manifest.
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE manifest_path='C:\\one\\a.txt' AND file_size=5 AND "
                    "timestamp=100 AND ctime=-294967296 AND attributes=32 AND target_path='C:\\one\\a.txt' AND "
                    "overwrite=1"),
              1);
}

TEST_F(RestoreRequests, AFailureLeavesNothingHalfWrittenAndOneLine)
{
    const struct {
        const char* breakIt;
        const char* mendIt;
        const char* logged;
    } cases[] = {
        {"CREATE TRIGGER t BEFORE INSERT ON restore_files WHEN new.manifest_path LIKE '%b.txt' BEGIN SELECT "
         "RAISE(ABORT,'no'); END",
         "DROP TRIGGER t", "1: Error: Error requesting restore: DB_CONSTRAINT[19]: no"},
        {"ALTER TABLE restore_files RENAME TO gone", "ALTER TABLE gone RENAME TO restore_files",
         "1: Error: Error requesting restore: DB_ERROR[1]: "},
        {"CREATE TRIGGER t BEFORE INSERT ON restore_files BEGIN SELECT RAISE(ROLLBACK,'all'); END", "DROP TRIGGER t",
         "1: Error: Error requesting restore: DB_CONSTRAINT[19]: all"}, // the library rolls back by itself
    };
    for (const auto& test : cases) {
        database_.execDML(test.breakIt);
        EXPECT_EQ(perform(L"C:\\one"), test.logged);
        EXPECT_EQ(count("SELECT count(*) FROM restores"), 0);
        database_.execDML(test.mendIt);
        EXPECT_EQ(count("SELECT count(*) FROM restore_files"), 0);
    }
    {
        // A disk that fills up at each write in turn, until none is needed any more.
        test::TestDisk disk;
        int writes = 0;
        for (std::string logged = "none yet"; !logged.empty() && writes < 100; ++writes) {
            disk.writesLeft() = writes;
            logged = perform(L"C:\\one");
            const bool failed = logged == "1: Error: Error requesting restore: DB_FULL[13]: database or disk is full";
            EXPECT_TRUE(failed || logged.empty()) << logged;
            EXPECT_EQ(count("SELECT (SELECT count(*) FROM restores)+(SELECT count(*) FROM restore_files)"),
                      failed ? 0 : 3);
        }
        EXPECT_GT(writes, 3);
        EXPECT_LT(writes, 100);
    }
    service_.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    EXPECT_EQ(perform(L"C:\\one"),
              "1: Error: Failed to open state db for restores: DB_CANTOPEN[14]: unable to open database file");
}

TEST_F(RestoreRequests, WaitAMinuteForAnotherWriter)
{
    database_.beginTransaction(2);
    {
        test::TestDisk disk;
        EXPECT_EQ(perform(L"C:\\one"), "1: Error: Error requesting restore: DB_BUSY[5]: database is locked");
        EXPECT_EQ(disk.waited(), 60000000);
    }
    std::thread other([&] { EXPECT_EQ(perform(L"C:\\one"), ""); });
    Sleep(300);
    database_.commitTransaction();
    other.join();
    EXPECT_EQ(count("SELECT count(*) FROM restore_files"), 2);
}

} // namespace
} // namespace tavi
