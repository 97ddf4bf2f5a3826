#include "manifest/ManifestWatcher.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

// Watchers whose sleeps are all that moves the clock.
struct ManifestWatcher : testing::Test {
    ManifestWatcher()
    {
        services.loadManifest = [this] { return load(++loads); };
        services.manifestTime = [this] { return stored; };
        services.now = [this] { return now; };
        services.sleep = [this](std::uint32_t milliseconds) {
            EXPECT_EQ(milliseconds, 500u) << "the time within which a stop request takes effect";
            now += milliseconds;
        };
        services.isStopping = [this] { return now >= end; };
        services.buildExclusions = [this](bool isFirst) {
            builds.push_back(isFirst ? 0 : now / 5000);
            throw std::runtime_error("must not end the watcher");
        };
    }
    // Runs one watcher for some polls and returns the number of all loads.
    int run(int polls)
    {
        end = now + 5000 * polls + 500;
        runManifestWatcher(state, services);
        EXPECT_EQ(now, end);
        return loads;
    }

    const LogCapture log;
    WatcherState state;
    WatcherServices services;
    int loads = 0;
    std::function<ManifestRef(int)> load = [](int number) {
        return Manifest::parse(wxString::Format("USER\n_hash|%d", number));
    };
    std::optional<std::int64_t> stored;
    std::int64_t now = 0, end = 0;
    std::vector<std::int64_t> builds;
};

TEST_F(ManifestWatcher, LoadsAManifestOnceAndOneThatWasStoredLater)
{
    EXPECT_EQ(run(2), 1) << "there is no time";
    for (const int later : {0, 1}) {
        stored = state.lastLoad + later;
        EXPECT_EQ(run(2), 1 + later) << "by a watcher that finds a manifest";
    }
    const std::int64_t last = state.lastLoad;
    services.manifestTime = [&] { return now < end - 500 ? last : last + 1; };
    EXPECT_EQ(run(2), 3) << "by a poll";
    EXPECT_EQ(dump(state.manifest.acquire()), "3[] ");
}

TEST_F(ManifestWatcher, LoadsWithTheNextExclusionBuildWhatItCouldNotLoadButNotWhatIsInvalid)
{
    load = [valid = load](int number) { return number == 3 || number == 5 ? valid(number) : throw std::bad_alloc(); };
    EXPECT_EQ(run(17), 1);
    EXPECT_EQ(run(36), 3) << "at once by another watcher, then after 18 polls";
    stored = now;
    EXPECT_EQ(run(17), 4);
    EXPECT_EQ(run(36), 5);
    stored = now;
    load = [](int) { return ManifestRef(); };
    EXPECT_EQ(run(19), 6);
    EXPECT_EQ(dump(state.manifest.acquire()), "5[] ");
}

TEST_F(ManifestWatcher, BuildsTheExclusionsAtTheStartAndEvery18thPoll)
{
    run(55);
    EXPECT_EQ(builds, (std::vector<std::int64_t>{0, 18, 36, 54}));
}

// The address space of a 32-bit host is fragmented.
TEST(readStoredManifest, NeedsNoLargeBlock)
{
    constexpr std::uint32_t kFiles = 300'000;
    std::string text = "FILES\n";
    for (std::uint32_t i = 0; i < kFiles; ++i) {
        const std::string name = std::to_string(i * 7919 % kFiles);
        text += name + "\\file\n1\n\nfolder\\" + name + "\n1\n\n";
    }
    const InstalledService service;
    service.createTables();
    service.storeManifest(packed(text));
    const FailingAllocations large(0, Heap::c, 1 << 30, (1 << 20) + 1);
    EXPECT_EQ(readStoredManifest()->fileCount(), 2 * kFiles);
}

TEST(readStoredManifest, IsEmptyWhereThereIsNoneAndLogsFailures)
{
    LogCapture log;
    const InstalledService service;
    bool lackedMemory = false;
    const auto read = [&] {
        try {
            EXPECT_EQ(dump(readStoredManifest()), "");
        } catch (const std::bad_alloc&) {
            lackedMemory = true;
        }
        return log.takeText();
    };
    const std::string failed = "2: Warning: Failed to retrieve stored manifest ";
    EXPECT_EQ(read(), failed + "(1: DB_ERROR[1]: )");
    DbConnection database = service.database(L"tavistate.dat");
    for (const char* const sql : {"CREATE TABLE manifest(contents)", "INSERT INTO manifest VALUES(NULL)"}) {
        database.execDML(sql);
        EXPECT_EQ(read(), "") << sql;
    }
    // No manifest, but so long that SQLite needs memory for its text. Where its inflation fails the service can write.
    database.execDML("PRAGMA busy_timeout=0; UPDATE manifest SET contents=zeroblob(20000)");
    int changes = 0;
    log.onNextLine([&] { changes = database.execDML("UPDATE manifest SET contents=contents"); });
    const std::string invalid = read();
    EXPECT_FALSE(lackedMemory);
    EXPECT_EQ(changes, 1);
    database.close();
    int succeeding = 0;
    for (std::string lines; lines != invalid && succeeding < 1000; ++succeeding) {
        lackedMemory = false;
        const FailingAllocations failing(succeeding, Heap::sqlite);
        lines = read();
        ASSERT_EQ(lackedMemory, lines.rfind(failed + "(7: DB_NOMEM[7]: ", 0) == 0) << succeeding << lines;
        ASSERT_TRUE(lackedMemory || lines == invalid) << succeeding << lines;
    }
    EXPECT_GT(succeeding, 20);
    EXPECT_TRUE(DeleteFileW(service.file(L"tavistate.dat").c_str())) << "a connection has stayed open";
}

} // namespace
} // namespace tavi
