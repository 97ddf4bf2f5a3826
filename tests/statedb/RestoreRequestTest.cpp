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
    static RestoreRequest requestOf(const wchar_t* selected, bool named = false)
    {
        RestoreRequest request;
        request.selectedPaths.insert(selected);
        request.cutoffTime = 100;
        request.overwrite = true;
        request.machineId = named ? L"id" : L"";
        request.machineAlias = named ? L"alias" : L"";
        request.encryptionKey = named ? L"key" : L"";
        return request;
    }
    // Returns what was logged.
    std::string perform(const wchar_t* selected, bool named = false)
    {
        RestoreRequest request = requestOf(selected, named);
        performRestore(request, *manifest_);
        EXPECT_TRUE(request.selectedPaths.empty());
        return log_.takeText();
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
    EXPECT_EQ(perform(L"C:\\nothing there", true), "");
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 2); // one without files is stored as well
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE restore_id=1"), 2);
    EXPECT_GE(count("SELECT min(request_time) FROM restores"), start); // the time of writing, not of the version
    EXPECT_EQ(count("SELECT count(*) FROM restores WHERE machine_id='' AND machine_alias='' AND encryption_key='' OR "
                    "machine_id='id' AND machine_alias='alias' AND encryption_key='key'"),
              2);
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
    service_.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    EXPECT_EQ(perform(L"C:\\one"),
              "1: Error: Failed to open state db for restores: DB_CANTOPEN[14]: unable to open database file");
}

// Disk or memory runs out at each point in turn and is back for the close, which must not store what was left behind.
TEST_F(RestoreRequests, AreWholeOrAbsentWhereDiskOrMemoryRunsOut)
{
    const RestorePlan plan = planRestore(requestOf(L"C:\\one"), *manifest_, [](const std::string&) { return false; });
    test::TestDisk disk;
    for (const bool memory : {false, true}) {
        const std::string line = "1: Error: Error requesting restore: DB_" + std::string(memory ? "NOMEM" : "FULL");
        int point = 0;
        for (bool written = false; !written && point < 1000; ++point) {
            RestoreRequestWriter writer;
            writer.open();
            {
                const test::TestHeap heap(point, memory ? 1 << 30 : 0);
                disk.writesLeft() = memory ? 1000 : point;
                written = writer.requestRestore(plan, L"", L"", L"");
            }
            disk.writesLeft() = 1000;
            writer.close();
            EXPECT_EQ(log_.takeText().substr(0, line.size()), written ? "" : line) << point;
            const int rows = count("SELECT (SELECT count(*) FROM restores)+(SELECT count(*) FROM restore_files)");
            ASSERT_TRUE(rows == 3 || (rows == 0 && !written)) << point << ": " << rows;
            if (rows > 0)
                database_.execDML("BEGIN; DELETE FROM restores; DELETE FROM restore_files; COMMIT");
        }
        EXPECT_TRUE(point > 3 && point < 1000) << point;
    }
    // A reader in the way of the commit; then no memory for that of the close.
    database_.beginTransaction(0);
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 0);
    EXPECT_EQ(perform(L"C:\\one"), "1: Error: Error requesting restore: DB_BUSY[5]: database is locked");
    database_.commitTransaction();
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 0);
    RestoreRequestWriter writer;
    writer.open();
    const test::TestHeap heap(0, 1);
    writer.close();
    EXPECT_EQ(log_.takeText(), "1: Error: Error committing restore information: DB_NOMEM[7]: out of memory");
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
