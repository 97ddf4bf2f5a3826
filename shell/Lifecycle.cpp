#include "shell/Lifecycle.h"

#include <cwchar>

#include <wx/log.h>

#include "backupset/CurrentManifest.h"
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

std::atomic<bool> statusStopFlag{false};
HANDLE statusThread = INVALID_HANDLE_VALUE;

void runStatusListener(void*)
{
    listenToStatus([] { return statusStopFlag.load(); });
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
}

void detachFromFileManager(bool processEnds)
{
    releaseShellAllocator();
    freeMenuBitmaps();
    StopManifestWatcher();
    statusStopFlag = true;
    StopStatusThread();
    if (!processEnds)
        shutDownDatabaseLibrary();
    CloseLog();
}

void StartStatusThread() noexcept
{
    if (HANDLE thread = startModuleThread(runStatusListener, nullptr))
        statusThread = thread;
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
    statusStopFlag = true;
}

} // namespace tavi
