#include "shell/Lifecycle.h"

#include <atomic>
#include <cwchar>

#include <wx/log.h>

#include "manifest/CurrentManifest.h"
#include "core/BackgroundThread.h"
#include "core/Handles.h"
#include "core/Log.h"
#include "link/StatusListener.h"
#include "statedb/Database.h"
#include "shell/ShellAllocator.h"
#include "ui/MenuBitmap.h"

namespace tavi {
namespace {

constexpr unsigned long kLogLevel = 3;
constexpr DWORD kStatusThreadPatienceMs = 500;

struct HostName {
    const wchar_t* name;
    HostKind kind;
};
const HostName kHosts[] = {{L"explorer.exe", HostKind::fileManager},
                           {L"regsvr32.exe", HostKind::toolOnly},
                           {L"verclsid.exe", HostKind::toolOnly},
                           {L"_RegDLL.tmp", HostKind::toolOnly}};

std::atomic<bool> isAttached{false};

BackgroundThread statusThread("status listener",
                              [](const BackgroundThread& self) { listenToStatus([&] { return self.isStopping(); }); });

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
    openLog(kLogLevel);
    wxLogInfo("Attaching to %s", wxString(hostPath));
    setModuleInstance(instance);
    acquireShellAllocator();
    DisableThreadLibraryCalls(instance);
    // Called for its side effect: it starts the watcher.
    getCurrentManifest();
    startStatusThread();
    isAttached = true;
}

void detachFromFileManager(bool processEnds)
{
    releaseShellAllocator();
    // At the end of a process every other thread was killed at an arbitrary instruction, perhaps inside a lock of the
    // heap, of a C stream or of GDI. The kernel takes back the rest without asking those.
    if (processEnds)
        return;
    freeMenuBitmaps();
    stopManifestWatcher();
    statusThread.requestStop();
    stopStatusThread();
    shutDownDatabaseLibrary();
    closeLog();
}

void startStatusThread() noexcept
{
    statusThread.start();
}

void stopStatusThread() noexcept
{
    const KernelHandle thread(statusThread.releaseHandle());
    // A listener that has ended is past all code of the module, but may still need the loader lock, which the detach
    // holds: to wait for it would be in vain. It may even be the thread that this runs on.
    if (thread && statusThread.isActive() &&
        WaitForSingleObject(thread.get(), kStatusThreadPatienceMs) != WAIT_OBJECT_0)
        TerminateThread(thread.get(), 0);
}

void requestThreadsStop() noexcept
{
    requestWatcherStop();
    statusThread.requestStop();
}

void resumeThreads() noexcept
{
    if (!isAttached)
        return;
    startStatusThread();
    resumeWatcher();
}

} // namespace tavi
