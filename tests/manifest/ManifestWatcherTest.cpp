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

class ManifestWatcher : public testing::Test {
  protected:
    // Load n happens at n seconds. The third is invalid and the fourth fails.
    void run(int sleeps)
    {
        WatcherServices services;
        services.loadManifest = [&] {
            if (++loads_ == 4)
                throw std::runtime_error("no manifest");
            return loads_ == 3 ? ManifestRef() : Manifest::parse(wxString::Format("USER\n_hash|%d", loads_));
        };
        services.manifestTime = [&] {
            constexpr std::optional<std::int64_t> kTimes[] = {{}, 1000, 1001, 1999, 2000, 9000, 9000, {}};
            return kTimes[std::min(polls_++, std::size(kTimes) - 1)];
        };
        services.now = [&] { return 1000 * loads_; };
        services.sleep = [&](std::uint32_t milliseconds) {
            EXPECT_EQ(milliseconds, 500u);
            --sleeps;
        };
        services.isStopping = [&] { return sleeps <= 0; };
        services.buildExclusions = [&](bool isFirst) {
            builds_.push_back(isFirst ? -1 : static_cast<int>(polls_));
            throw std::runtime_error("must not end the watcher");
        };
        runManifestWatcher(state_, services);
        EXPECT_EQ(sleeps, 0);
    }
    const LogCapture log_;
    WatcherState state_;
    int loads_ = 0;
    std::size_t polls_ = 0;
    std::vector<int> builds_;
};

TEST_F(ManifestWatcher, ReloadsForALaterTimeAndKeepsTheLastValidManifest)
{
    run(10 * 8);
    EXPECT_EQ(loads_, 4);
    EXPECT_EQ(dump(state_.manifest.acquire()), "2[] ");
}

TEST_F(ManifestWatcher, RebuildsTheExclusionsEvery18thPoll)
{
    run(10 * 55 + 3);
    EXPECT_EQ(builds_, (std::vector<int>{-1, 18, 36, 54}));
    EXPECT_EQ(polls_, 55u);
}

TEST_F(ManifestWatcher, StartedAgainLoadsAChangedManifestOnly)
{
    // The time of the third run's poll is later than the first load.
    for (const int loads : {1, 1, 1, 2, 2}) {
        run(0);
        EXPECT_EQ(loads_, loads) << "after poll " << polls_;
    }
}

TEST(readStoredManifest, IsEmptyWhereThereIsNoneAndLogsFailures)
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
