#include "manifest/CurrentManifest.h"

#include <atomic>
#include <utility>

#include <wx/datetime.h>

#include "core/BackgroundThread.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "core/ScopeGuard.h"
#include "manifest/ManifestWatcher.h"

namespace tavi {
namespace {

// One reference, which any thread may exchange for another. Its owner must exchange it for null in the end.
class SharedReference {
  public:
    // Returns the former reference.
    ManifestRef exchange(ManifestRef next) noexcept
    {
        return ManifestRef::adopt(manifest_.exchange(next.release()));
    }

  private:
    std::atomic<const Manifest*> manifest_{nullptr};
};

WatcherState watcher;
std::atomic<ExclusionBuilder> exclusionBuilder{nullptr};
// The reference of the newest menu.
SharedReference menuManifest;
// The reference of the menu before. The watcher releases it: to destroy a large manifest takes longer than a menu may.
SharedReference retiredManifest;

// Created before the process entry runs. Serializes the start of the watcher.
const KernelHandle manifestMutex(CreateMutexW(nullptr, FALSE, nullptr));

void watchManifest(const BackgroundThread& self)
{
    WatcherServices services;
    services.loadManifest = readStoredManifest;
    services.manifestTime = readManifestTime;
    services.now = [] { return wxDateTime::Now().GetValue().GetValue(); };
    services.sleep = [](std::uint32_t milliseconds) {
        Sleep(milliseconds);
        retiredManifest.exchange({});
    };
    services.isStopping = [&] { return self.isStopping(); };
    services.buildExclusions = [](bool isFirst) {
        if (const ExclusionBuilder build = exclusionBuilder)
            build(isFirst);
    };
    runManifestWatcher(watcher, services);
}

BackgroundThread watcherThread("manifest watcher", watchManifest);

} // namespace

void setExclusionBuilder(ExclusionBuilder builder) noexcept
{
    exclusionBuilder = builder;
}

ManifestRef getCurrentManifest() noexcept
{
    if (ManifestRef manifest = watcher.manifest.acquire())
        return manifest;
    const DWORD wait = WaitForSingleObject(manifestMutex.get(), 0);
    if (wait == WAIT_OBJECT_0 || wait == WAIT_ABANDONED) {
        const ScopeGuard release([] { ReleaseMutex(manifestMutex.get()); });
        if (!watcher.manifest.acquire())
            watcherThread.start();
    }
    return watcher.manifest.acquire();
}

void holdManifestForMenu() noexcept
{
    ManifestRef current = getCurrentManifest();
    const Manifest* const held = current.get();
    ManifestRef previous = menuManifest.exchange(std::move(current));
    if (previous && previous.get() != held)
        retiredManifest.exchange(std::move(previous));
}

void requestWatcherStop() noexcept
{
    watcherThread.requestStop();
}

void resumeWatcher() noexcept
{
    watcherThread.start();
}

bool isWatcherActive() noexcept
{
    return watcherThread.isActive();
}

void stopManifestWatcher() noexcept
{
    requestWatcherStop();
    // Waits for a start in progress, not for the thread. The mutex stays locked, so that nothing starts afterwards.
    if (isWatcherActive())
        WaitForSingleObject(manifestMutex.get(), INFINITE);
    if (const HANDLE thread = watcherThread.releaseHandle())
        CloseHandle(thread);
    watcher.manifest.replace({});
    menuManifest.exchange({});
    retiredManifest.exchange({});
}

} // namespace tavi
