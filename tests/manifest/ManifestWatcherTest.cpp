#include "manifest/ManifestWatcher.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

TEST(ManifestWatcher, LoadsChangedManifestsOnlyAndRebuildsTheExclusionsEvery18thPoll)
{
    const LogCapture log;
    WatcherState state;
    WatcherServices services;
    // Load n happens at n seconds. The third is invalid and the fourth fails.
    int loads = 0;
    services.loadManifest = [&] {
        if (++loads == 4)
            throw std::runtime_error("no manifest");
        return loads == 3 ? ManifestRef() : Manifest::parse(wxString::Format("USER\n_hash|%d", loads));
    };
    const std::optional<std::int64_t> times[] = {{}, 1000, 1001, 1999, 2000, 9000, 9000, {}};
    std::size_t polls = 0;
    services.manifestTime = [&] { return times[std::min(polls++, std::size(times) - 1)]; };
    services.now = [&] { return 1000 * loads; };
    std::uint32_t slept = 0, length = 0;
    services.sleep = [&](std::uint32_t milliseconds) { slept += milliseconds; };
    services.isStopping = [&] { return slept >= length; };
    std::vector<std::size_t> builds;
    services.buildExclusions = [&](bool isFirst) {
        builds.push_back(isFirst ? 0 : polls);
        throw std::runtime_error("must not end the watcher");
    };
    // The time of the third run's poll is later than the first load.
    for (const int expected : {1, 1, 1, 2, 2}) {
        runManifestWatcher(state, services);
        EXPECT_EQ(loads, expected) << "after poll " << polls;
    }
    length = 5000 * 55 + 1500;
    runManifestWatcher(state, services);
    EXPECT_EQ(loads, 4);
    EXPECT_EQ(dump(state.manifest.acquire()), "2[] ");
    EXPECT_EQ(builds, (std::vector<std::size_t>{0, 0, 0, 0, 0, 0, 23, 41, 59}));
}

TEST(readStoredManifest, IsEmptyWhereThereIsNoneAndLogsFailures)
{
    LogCapture log;
    const InstalledService service;
    const auto read = [&] {
        EXPECT_EQ(dump(readStoredManifest()), "");
        return log.takeText();
    };
    const std::string failed = "2: Warning: Failed to retrieve stored manifest ";
    EXPECT_EQ(read(), failed + "(1: DB_ERROR[1]: )");
    DbConnection database = service.database(L"tavistate.dat");
    for (const char* const sql : {"CREATE TABLE manifest(contents)", "INSERT INTO manifest VALUES(NULL)"}) {
        database.execDML(sql);
        EXPECT_EQ(read(), "") << sql;
    }
    // No manifest, but so long that SQLite needs memory for its text.
    database.execDML("UPDATE manifest SET contents=zeroblob(20000)");
    database.close();
    const std::string invalid = read();
    int succeeding = 0;
    for (std::string lines; lines != invalid && succeeding < 1000; ++succeeding) {
        const FailingAllocations failing(succeeding, Heap::sqlite);
        lines = read();
        ASSERT_TRUE(lines == invalid || lines.rfind(failed + "(7: DB_NOMEM[7]: ", 0) == 0) << succeeding << lines;
    }
    EXPECT_GT(succeeding, 20);
    EXPECT_TRUE(DeleteFileW(service.file(L"tavistate.dat").c_str())) << "a connection has stayed open";
}

} // namespace
} // namespace tavi
