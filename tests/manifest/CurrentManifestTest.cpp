#include "manifest/CurrentManifest.h"

#include <thread>

#include <malloc.h>

#include "tests/support/Dialogs.h"
#include "tools/filemanager/Counts.h"

namespace tavi {
namespace {

using namespace test;

using CurrentManifestTest = UiTest;

const auto isLoaded = [] { return static_cast<bool>(getCurrentManifest()); };

TEST_F(CurrentManifestTest, IsNullAtOnceUntilOneWatcherHasLoadedIt)
{
    const int threads = filemanager::threadCount();
    DbConnection database = service.database(L"tavistate.dat");
    database.execDML("BEGIN EXCLUSIVE"); // holds up the load
    std::vector<std::thread> callers(8);
    for (std::thread& caller : callers)
        caller = std::thread([] { EXPECT_FALSE(isLoaded()); });
    for (std::thread& caller : callers)
        caller.join();
    EXPECT_TRUE(waitUntil([&] { return filemanager::threadCount() == threads + 1; }));
    database.execDML("COMMIT");
    EXPECT_TRUE(waitUntil(isLoaded));
    stopManifestWatcher(); // takes the mutex of the start for this thread
    EXPECT_TRUE(waitUntil([] { return !isWatcherActive(); }));
    std::thread([] { EXPECT_FALSE(isLoaded() || isWatcherActive()); }).join();
    EXPECT_TRUE(waitUntil(isLoaded)) << "started by the owner of the mutex";
    stopManifestWatcher();
}

TEST_F(CurrentManifestTest, IsKeptForTheNewestMenuOnly)
{
    EXPECT_TRUE(waitUntil(isLoaded));
    const Manifest* manifest = getCurrentManifest().get();
    const auto isFreed = [&] { return !HeapValidate(reinterpret_cast<HANDLE>(_get_heap_handle()), 0, manifest); };
    holdManifestForMenu();
    holdManifestForMenu();
    // Makes the watcher load the manifest again, within five seconds.
    wxRegKey settings = settingsKey();
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2037-01-02 03:04:05");
    EXPECT_TRUE(waitUntil([&] { return getCurrentManifest().get() != manifest; }));
    settings.DeleteSelf();
    EXPECT_FALSE(isFreed()) << "a menu has seen it";
    holdManifestForMenu();
    EXPECT_TRUE(waitUntil(isFreed)) << "manifests pile up";
    manifest = getCurrentManifest().get();
    stopManifestWatcher();
    EXPECT_TRUE(isFreed());
}

} // namespace
} // namespace tavi
