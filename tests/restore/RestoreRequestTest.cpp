#include "restore/RestoreRequest.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;

namespace {

struct RestoreRequests : testing::Test {
    // Returns what was logged.
    std::string perform(const wchar_t* selected = L"C:\\one", bool isNamed = true, bool overwrites = true)
    {
        RestoreRequest request{{selected}, 100, L"", L"", overwrites, L"id", L"alias", L"key"};
        if (!isNamed)
            request.machineId = request.machineAlias = request.encryptionKey = wxString();
        performRestore(request, *manifest);
        EXPECT_TRUE(request.selectedPaths.empty());
        return log.takeText();
    }
    int count(const char* sql = "SELECT (SELECT count(*) FROM restores)+(SELECT count(*) FROM restore_files)")
    {
        return database.execQuery(sql).fieldInt(0, -1);
    }

    test::LogCapture log;
    test::InstalledService service;
    DbConnection database = (service.createTables(), service.database(L"tavistate.dat"));
    const ManifestRef manifest =
        Manifest::parse(L"FILES\nC:\\one\\a.txt\n100:1:4000000000:5:0:x:0:40\n\nC:\\one\\b.txt\n100:1:2:6:0:x:0:41\n\n"
                        L"C:\\windows\n1:1:1:1:0::0:0\n\nC:\\windows\\none\n1:1:1:1:0::0:0");
};

TEST_F(RestoreRequests, AreStoredWithTheirFiles)
{
    EXPECT_EQ(perform(), "");
    EXPECT_EQ(perform(L"C:\\nothing there", false), "");
    EXPECT_EQ(count(), 2 + 2) << "a request without files is stored as well";
    EXPECT_EQ(count("SELECT count(*) FROM restores WHERE machine_id='' AND machine_alias='' AND encryption_key=''"), 1)
        << "not NULL";
    // Its time is not the version's. Times are signed 32-bit numbers; attributes are octal in the manifest.
    EXPECT_EQ(count("SELECT count(*) FROM restores JOIN restore_files ON restores.rowid=restore_id WHERE "
                    "abs(request_time-strftime('%s','now'))<60 AND machine_id='id' AND machine_alias='alias' AND "
                    "encryption_key='key' AND file_size=5 AND timestamp=100 AND ctime=-294967296 AND attributes=32 AND "
                    "manifest_path='C:\\one\\a.txt' AND target_path=manifest_path AND overwrite=1"),
              1);
    EXPECT_EQ(perform(L"C:\\windows", true, false), "");
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE overwrite=0 AND target_path=manifest_path||CASE "
                    "manifest_path WHEN 'C:\\windows' THEN ' (1)' ELSE '' END"),
              2);
}

TEST_F(RestoreRequests, WaitAMinuteForOtherTransactions)
{
    static int waited;
    sqlite3_vfs* const system = sqlite3_vfs_find(nullptr);
    const auto sleep = std::exchange(system->xSleep, [](sqlite3_vfs*, int time) { return waited += time, time; });
    // A reader blocks the commit, a writer the first row.
    for (const auto mode : {TransactionMode::plain, TransactionMode::immediate}) {
        const Transaction other(database, mode);
        EXPECT_EQ(waited = count(), 0);
        EXPECT_EQ(perform(), "1: Error: Error requesting restore: DB_BUSY[5]: database is locked");
        EXPECT_EQ(waited, 60000000);
        EXPECT_EQ(count(), 0);
    }
    system->xSleep = sleep;
}

// SQLite's memory runs out at each point in turn, for one allocation, for a few or for good.
TEST_F(RestoreRequests, AreWholeOrAbsentIfMemoryRunsOut)
{
    std::set<std::string> logged;
    for (const int failures : {1, 4, 1 << 30}) {
        std::string line;
        for (int point = 0; point < 300; ++point) {
            line = (test::FailingAllocations(point, test::Heap::sqlite, failures), perform());
            logged.insert(line.substr(0, line.find("[7]")));
            ASSERT_EQ(count() % 3, 0) << point << " " << failures << " " << line;
        }
        EXPECT_EQ(line, "") << "all points were reached";
    }
    EXPECT_EQ(logged, (std::set<std::string>{"", "1: Error: Failed to open state db for restores: DB_NOMEM",
                                             "1: Error: Error requesting restore: DB_NOMEM",
                                             "1: Error: Error committing restore information: DB_NOMEM"}));
}

} // namespace
