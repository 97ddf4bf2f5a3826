#include "manifest/CurrentManifest.h"

#include <atomic>

#include <wx/datetime.h>

#include "exclusions/Graylist.h"
#include "manifest/ManifestWatcher.h"
#include "core/BackgroundThread.h"
#include "core/Handles.h"
#include "core/Options.h"

namespace tavi {
namespace {

WatcherState watcher;
// The reference of the newest menu, and one that a menu before it had. The watcher releases that: to destroy a manifest
// of many files takes longer than a menu may.
std::atomic<const Manifest*> menuManifest{nullptr};
std::atomic<const Manifest*> retiredManifest{nullptr};

void replaceReference(std::atomic<const Manifest*>& holder, const Manifest* next) noexcept
{
    if (const Manifest* const previous = holder.exchange(next))
        previous->Release();
}

// Created before the process entry runs; serialises only the start of the watcher.
const KernelHandle manifestMutex(CreateMutexW(nullptr, FALSE, nullptr));

class SystemServices : public WatcherServices {
  public:
    explicit SystemServices(const BackgroundThread& thread) : thread_(thread) {}
    ManifestRef loadManifest() override
    {
        return readStoredManifest();
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        const auto time = readManifestTime();
        milliseconds = time.value_or(0);
        return time.has_value();
    }
    std::int64_t now() override
    {
        return wxDateTime::Now().GetValue().GetValue();
    }
    void sleep(std::uint32_t milliseconds) override
    {
        Sleep(milliseconds);
        replaceReference(retiredManifest, nullptr);
    }
    bool isStopping() override
    {
        return thread_.isStopping();
    }
    void buildExclusions(bool firstLoad) override
    {
        buildGraylist(!firstLoad);
    }

  private:
    const BackgroundThread& thread_;
};

BackgroundThread watcherThread("manifest watcher", [](const BackgroundThread& self) {
    SystemServices services(self);
    runManifestWatcher(watcher, services);
});

} // namespace

ManifestRef getCurrentManifest() noexcept
{
    if (ManifestRef manifest = watcher.manifest.acquire())
        return manifest;
    const DWORD wait = WaitForSingleObject(manifestMutex.get(), 0);
    if (wait == WAIT_OBJECT_0 || wait == WAIT_ABANDONED) {
        if (ManifestRef manifest = watcher.manifest.acquire()) {
            ReleaseMutex(manifestMutex.get());
            return manifest;
        }
        watcherThread.start();
    }
    // Also without the mutex: releasing what is not held fails, and that is all.
    ReleaseMutex(manifestMutex.get());
    return watcher.manifest.acquire();
}

void holdManifestForMenu() noexcept
{
    const Manifest* const current = getCurrentManifest().release();
    const Manifest* const previous = menuManifest.exchange(current);
    if (previous == current && previous)
        previous->Release();
    else if (previous)
        replaceReference(retiredManifest, previous);
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
    // The wait is for a start in progress, not for the thread, and the mutex stays taken: nothing may start after this.
    if (isWatcherActive())
        WaitForSingleObject(manifestMutex.get(), INFINITE);
    if (const HANDLE thread = watcherThread.releaseHandle())
        CloseHandle(thread);
    watcher.manifest.replace({});
    replaceReference(menuManifest, nullptr);
    replaceReference(retiredManifest, nullptr);
    dropGraylist();
}

} // namespace tavi
