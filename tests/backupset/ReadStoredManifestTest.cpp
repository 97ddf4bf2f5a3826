#include "backupset/ManifestWatcher.h"

#include <gtest/gtest.h>

#include "statedb/Database.h"
#include "tests/backupset/ManifestSupport.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"
#include "tests/support/TestDisk.h"

namespace tavi {
namespace {

using namespace test;

TEST(ReadStoredManifest, IsEmptyWhereThereIsNoneAndWarnsOfFailures)
{
    LogCapture log;
    InstalledService service;
    const auto read = [&] {
        EXPECT_EQ(dump(held(ReadStoredManifest())), "");
        return log.takeText();
    };
    const std::string failed = "2: Warning: Failed to retrieve stored manifest ";
    EXPECT_EQ(read(), failed + "(1: DB_ERROR[1]: )");
    {
        DbConnection database;
        database.open(service.file(L"tavistate.dat"));
        for (const char* const sql : {"CREATE TABLE manifest(contents)", "INSERT INTO manifest VALUES(NULL)",
                                      "UPDATE manifest SET contents=x''", "UPDATE manifest SET contents=''"}) {
            database.execDML(sql);
            EXPECT_EQ(read(), "") << sql;
        }
        // No manifest, but so long that SQLite needs memory for its text.
        database.execDML("UPDATE manifest SET contents=zeroblob(20000)");
    }
    const std::string invalid = read();
    int succeeding = 0;
    for (std::string lines; lines != invalid && succeeding < 1000; ++succeeding) {
        const TestHeap heap(succeeding);
        lines = read();
        ASSERT_TRUE(lines == invalid || lines.rfind(failed + "(7: DB_NOMEM[7]: ", 0) == 0) << succeeding << lines;
    }
    EXPECT_GT(succeeding, 20);
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    EXPECT_EQ(read(), failed + "(14: DB_CANTOPEN[14]: unable to open database file)");
}

} // namespace
} // namespace tavi
