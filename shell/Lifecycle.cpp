#include "shell/Lifecycle.h"

#include <atomic>
#include <cwchar>
#include <memory>
#include <mutex>
#include <utility>

#include <wx/log.h>

#include "backupset/CurrentManifest.h"
#include "core/Boundary.h"
#include "core/CriticalSection.h"
#include "core/Log.h"
#include "link/StatusListener.h"
#include "statedb/Database.h"
#include "ui/MenuBitmap.h"

namespace tavi {
namespace {

constexpr unsigned long kLogLevel = 3;
constexpr DWORD kStatusThreadPatience = 500;

struct HostName {
    const wchar_t* name;
    HostKind kind;
};
const HostName kHosts[] = {{L"explorer.exe", HostKind::fileManager},
                           {L"regsvr32.exe", HostKind::toolOnly},
                           {L"verclsid.exe", HostKind::toolOnly},
                           {L"_RegDLL.tmp", HostKind::toolOnly}};

// Each listener has its own: one that was asked to stop stays so when another takes its place.
using StopFlag = std::shared_ptr<std::atomic<bool>>;
CriticalSection statusLock;
std::atomic<bool> isAttached{false};
StopFlag statusStopFlag;
HANDLE statusThread = INVALID_HANDLE_VALUE;

void runStatusListener(void* argument)
{
    const std::unique_ptr<StopFlag> stop(static_cast<StopFlag*>(argument));
    listenToStatus([&] { return (*stop)->load(); });
}

void requestStatusStop() noexcept
{
    const std::lock_guard guard(statusLock);
    if (statusStopFlag)
        *statusStopFlag = true;
}

} // namespace

HostKind hostKindOf(const wchar_t* executablePath) noexcept
{
    const wchar_t* const slash = std::wcsrchr(executablePath, L'\\');
    const wchar_t* const name = slash ? slash + 1 : executablePath;
    for (const HostName& host : kHosts) {
        if (_wcsnicmp(name, host.name, std::wcslen(host.name)) == 0)
            return host.kind;
    }
    return HostKind::refused;
}

void attachToFileManager(HINSTANCE instance, const wchar_t* hostPath)
{
    OpenLog(kLogLevel);
    wxLogInfo("Attaching to %s", wxString(hostPath));
    setModuleInstance(instance);
    acquireShellAllocator();
    DisableThreadLibraryCalls(instance);
    // Asked for its side effect: the watcher starts.
    if (const Manifest* manifest = GetCurrentManifest())
        manifest->Release();
    StartStatusThread();
    isAttached = true;
}

void detachFromFileManager(bool processEnds)
{
    releaseShellAllocator();
    freeMenuBitmaps();
    StopManifestWatcher();
    requestStatusStop();
    StopStatusThread();
    if (!processEnds)
        shutDownDatabaseLibrary();
    CloseLog();
}

void StartStatusThread() noexcept
{
    guarded("status thread start", [] {
        auto stop = std::make_unique<StopFlag>(std::make_shared<std::atomic<bool>>(false));
        // Looked at and replaced in one step: two threads that come back at once must not start two.
        const std::lock_guard guard(statusLock);
        if (statusStopFlag && !*statusStopFlag)
            return;
        if (statusThread != INVALID_HANDLE_VALUE)
            CloseHandle(std::exchange(statusThread, INVALID_HANDLE_VALUE));
        statusStopFlag = *stop;
        if (HANDLE thread = startModuleThread(runStatusListener, stop.get())) {
            statusThread = thread;
            static_cast<void>(stop.release());
        } else {
            // To be tried again when the module is used next.
            *statusStopFlag = true;
        }
    });
}

void StopStatusThread() noexcept
{
    const HANDLE thread = std::exchange(statusThread, INVALID_HANDLE_VALUE);
    if (thread == INVALID_HANDLE_VALUE)
        return;
    // The thread's own last reference may be what unloads the module: then this runs on it, and it must not wait for
    // itself.
    if (GetThreadId(thread) != GetCurrentThreadId() &&
        WaitForSingleObject(thread, kStatusThreadPatience) != WAIT_OBJECT_0)
        TerminateThread(thread, 0);
    CloseHandle(thread);
}

void requestThreadsStop() noexcept
{
    requestWatcherStop();
    requestStatusStop();
}

void resumeThreads() noexcept
{
    if (!isAttached)
        return;
    StartStatusThread();
    resumeWatcher();
}

} // namespace tavi
