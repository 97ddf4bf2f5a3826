#include "manifest/ManifestWatcher.h"

#include <stdexcept>
#include <vector>

#include <gtest/gtest.h>

#include "statedb/Database.h"
#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

// The times are what the service's setting says, round by round; the third load is invalid and the fourth fails.
class ScriptedServices : public WatcherServices {
  public:
    ManifestRef loadManifest() override
    {
        ++loads;
        if (loads == 4)
            throw std::runtime_error("no manifest");
        return loads == 3 ? ManifestRef() : Manifest::parse(wxString::Format("USER\n_hash|%d", loads));
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        const std::int64_t times[] = {-1, 1000, 1001, 1999, 2000, 9000, 9000};
        milliseconds = rounds < std::size(times) ? times[rounds] : -1;
        ++rounds;
        return milliseconds >= 0;
    }
    std::int64_t now() override
    {
        return 1000 * loads;
    }
    void sleep(std::uint32_t milliseconds) override
    {
        EXPECT_EQ(milliseconds, 500u);
        --naps;
    }
    bool isStopping() override
    {
        return naps <= 0;
    }
    void buildExclusions(bool firstLoad) override
    {
        builds.push_back(firstLoad ? -1 : static_cast<int>(rounds));
        throw std::runtime_error("must not end the watcher");
    }

    WatcherState state;
    int naps = 0, loads = 0;
    std::uint32_t rounds = 0;
    std::vector<int> builds;
};

TEST(ManifestWatcher, ReloadsForALaterTimeRebuildsEvery18thRoundAndStopsWithinANap)
{
    const LogCapture log;
    // The n-th load is at n seconds, and a load does not take over the time that the service wrote.
    ScriptedServices services;
    services.naps = 10 * 55 + 3;
    runManifestWatcher(services.state, services);
    EXPECT_EQ(services.naps, 0);
    EXPECT_EQ(services.loads, 4);
    EXPECT_EQ(services.rounds, 55u);
    EXPECT_EQ(services.builds, (std::vector<int>{-1, 18, 36, 54}));
    // The invalid and the failing one leave the one in force.
    EXPECT_EQ(dump(services.state.manifest.acquire()), "2[] ");

    // The first load is not skipped. A second run finds the manifest of the first: it loads a changed one only. The
    // third round's time is later.
    ScriptedServices stopped;
    for (const int loads : {1, 1, 1, 2, 2}) {
        runManifestWatcher(stopped.state, stopped);
        EXPECT_EQ(stopped.loads, loads) << stopped.rounds;
    }
}

TEST(readStoredManifest, IsEmptyWhereThereIsNoneAndWarnsOfFailures)
{
    LogCapture log;
    InstalledService service;
    const auto read = [&] {
        EXPECT_EQ(dump(readStoredManifest()), "");
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
        const FailingAllocations failing(succeeding, Heap::sqlite);
        lines = read();
        ASSERT_TRUE(lines == invalid || lines.rfind(failed + "(7: DB_NOMEM[7]: ", 0) == 0) << succeeding << lines;
    }
    EXPECT_GT(succeeding, 20);
    EXPECT_TRUE(DeleteFileW(service.file(L"tavistate.dat").c_str())) << "a connection has stayed open";
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    EXPECT_EQ(read(), failed + "(14: DB_CANTOPEN[14]: unable to open database file)");
}

} // namespace
} // namespace tavi
