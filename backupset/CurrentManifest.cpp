#include "backupset/CurrentManifest.h"

#include <wx/datetime.h>

#include "backupset/Graylist.h"
#include "backupset/ManifestWatcher.h"
#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/Module.h"
#include "core/Options.h"

namespace tavi {
namespace {

// The mutex is only ever held for a start.
constexpr DWORD kStartPatience = 1000;

WatcherState watcher;
// Made before the process entry runs; serialises only the start of the watcher.
const KernelHandle manifestMutex(CreateMutexW(nullptr, FALSE, nullptr));

class SystemServices : public WatcherServices {
  public:
    const Manifest* loadManifest() override
    {
        return ReadStoredManifest();
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
    }
    void buildExclusions(bool firstLoad) override
    {
        BuildGraylist(!firstLoad);
    }
};

void closeWatcherHandle() noexcept
{
    KernelHandle(watcher.thread.exchange(nullptr));
}

void startIfNone() noexcept;

void watcherThread(void*)
{
    bool stopped = false;
    do {
        stopped = false;
        guarded("manifest watcher", [&] {
            SystemServices services;
            RunManifestWatcher(watcher, services);
            stopped = true;
        });
    } while (stopped && watcher.stopFlag == 0);
    closeWatcherHandle();
    // Whoever took the request back between the two lines above has seen a thread that was still there.
    if (stopped && watcher.stopFlag == 0)
        startIfNone();
}

void startWatcher() noexcept
{
    watcher.stopFlag = 0;
    // Suspended until the handle is stored: the thread takes it back as it ends, which may be at once.
    if (HANDLE thread = startModuleThread(watcherThread, nullptr, true)) {
        watcher.thread = thread;
        ResumeThread(thread);
    }
}

void startIfNone() noexcept
{
    const DWORD wait = WaitForSingleObject(manifestMutex.get(), kStartPatience);
    if (wait != WAIT_OBJECT_0 && wait != WAIT_ABANDONED)
        return;
    if (!watcher.thread.load())
        startWatcher();
    ReleaseMutex(manifestMutex.get());
}

} // namespace

const Manifest* GetCurrentManifest() noexcept
{
    if (const Manifest* manifest = watcher.manifest.acquire())
        return manifest;
    const DWORD wait = WaitForSingleObject(manifestMutex.get(), 0);
    if (wait == WAIT_OBJECT_0 || wait == WAIT_ABANDONED) {
        if (const Manifest* manifest = watcher.manifest.acquire()) {
            ReleaseMutex(manifestMutex.get());
            return manifest;
        }
        if (!watcher.thread.load())
            startWatcher();
    }
    // Also without the mutex: releasing what is not held fails, and that is all.
    ReleaseMutex(manifestMutex.get());
    return watcher.manifest.acquire();
}

void requestWatcherStop() noexcept
{
    watcher.stopFlag = 1;
}

void resumeWatcher() noexcept
{
    if (watcher.stopFlag.exchange(0) != 0)
        startIfNone();
}

void StopManifestWatcher() noexcept
{
    requestWatcherStop();
    if (watcher.thread.load()) {
        // The wait is for a start in progress, not for the thread, and the mutex stays taken: nothing may start after
        // this.
        WaitForSingleObject(manifestMutex.get(), INFINITE);
        closeWatcherHandle();
    }
    watcher.manifest.replace(nullptr);
    DropGraylist();
}

} // namespace tavi
