#include "manifest/CurrentManifest.h"

#include <atomic>
#include <thread>

#include <malloc.h>

#include "core/InstallPaths.h"
#include "statedb/Database.h"
#include "tests/support/Counts.h"
#include "tests/support/Dialogs.h"

namespace tavi {
namespace {

using namespace test;

struct CurrentManifestTest : UiTest {
    ~CurrentManifestTest() override
    {
        stopManifestWatcher();
        EXPECT_TRUE(waitUntil([] { return !isWatcherActive(); }));
    }
    static bool isLoaded()
    {
        return static_cast<bool>(getCurrentManifest());
    }
    bool hasWatcher(bool expected) const
    {
        return waitUntil([&] { return countThreads() == threads + (expected ? 1u : 0u); });
    }
    const std::size_t threads = countThreads();
};

TEST_F(CurrentManifestTest, IsNullAtFirstAndStartsOneWatcher)
{
    DbConnection database;
    database.open(service.file(L"tavistate.dat"));
    database.execDML("BEGIN EXCLUSIVE"); // holds up the load
    std::vector<std::thread> callers(8);
    for (std::thread& caller : callers)
        caller = std::thread([&] { EXPECT_FALSE(isLoaded()); });
    for (std::thread& caller : callers)
        caller.join();
    EXPECT_TRUE(!isLoaded() && hasWatcher(true));
    database.execDML("COMMIT");
    EXPECT_TRUE(waitUntil(isLoaded));
}

TEST_F(CurrentManifestTest, IsNullAtOnceWhileAnotherThreadHoldsTheMutexOfTheStart)
{
    EXPECT_TRUE(waitUntil(isLoaded));
    stopManifestWatcher(); // takes the mutex for this thread
    EXPECT_TRUE(hasWatcher(false));
    static std::atomic<bool> isNull{false};
    std::thread([&] { isNull = !isLoaded(); }).detach();
    EXPECT_TRUE(waitUntil([] { return isNull.load(); })) << "the call waits, or there is a manifest";
    EXPECT_TRUE(hasWatcher(false)) << "nothing was started";
    EXPECT_TRUE(waitUntil(isLoaded) && hasWatcher(true)) << "by the owner of the mutex";
}

TEST_F(CurrentManifestTest, IsKeptForTheNewestMenuOnly)
{
    const auto heap = reinterpret_cast<HANDLE>(_get_heap_handle());
    const Manifest* manifest = nullptr;
    EXPECT_TRUE(waitUntil([&] { return (manifest = getCurrentManifest().get()) != nullptr; }));
    holdManifestForMenu();
    holdManifestForMenu();
    // Makes the watcher load the manifest again, within five seconds.
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2037-01-02 03:04:05");
    EXPECT_TRUE(waitUntil([&] { return getCurrentManifest().get() != manifest; }));
    settings.DeleteSelf();
    EXPECT_TRUE(HeapValidate(heap, 0, manifest)) << "a menu has seen it";
    holdManifestForMenu();
    EXPECT_TRUE(waitUntil([&] { return !HeapValidate(heap, 0, manifest); })) << "manifests pile up";
    manifest = getCurrentManifest().get();
    stopManifestWatcher();
    EXPECT_FALSE(HeapValidate(heap, 0, manifest));
}

} // namespace
} // namespace tavi
