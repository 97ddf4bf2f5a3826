#include "shell/Lifecycle.h"

#include <atomic>
#include <cwchar>

#include <shlobj.h>

#include "core/BackgroundThread.h"
#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/Log.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "exclusions/Graylist.h"
#include "link/StatusListener.h"
#include "manifest/CurrentManifest.h"
#include "statedb/Database.h"
#include "ui/MenuBitmap.h"
#include "ui/Translations.h"

namespace tavi {
namespace {

// wxLOG_Message: keeps errors and warnings, drops the line of the attach.
constexpr unsigned long kLogLevel = 3;
constexpr DWORD kStatusThreadTimeoutMs = 500;

struct HostName {
    const wchar_t* name;
    HostKind kind;
};
const HostName kHosts[] = {{L"explorer.exe", HostKind::fileManager},
                           {L"regsvr32.exe", HostKind::toolOnly},
                           {L"verclsid.exe", HostKind::toolOnly},
                           {L"_RegDLL.tmp", HostKind::toolOnly}};

std::atomic<bool> isAttached{false};
std::atomic<IMalloc*> theShellAllocator{nullptr};

BackgroundThread statusThread("status listener",
                              [](const BackgroundThread& self) { listenToStatus([&] { return self.isStopping(); }); });

// Makes the C++ runtime allocate what the first exception of a process needs: that one may say that no memory is left.
void prepareExceptions() noexcept
{
    try {
        throw 0;
    } catch (...) {
    }
}

void acquireShellAllocator() noexcept
{
    IMalloc* allocator = nullptr;
    if (SUCCEEDED(SHGetMalloc(&allocator)))
        theShellAllocator = allocator;
}

void releaseShellAllocator() noexcept
{
    if (IMalloc* allocator = theShellAllocator.exchange(nullptr))
        allocator->Release();
}

// Waits half a second for the status listener, then terminates it.
void stopStatusThread() noexcept
{
    const KernelHandle thread(statusThread.releaseHandle());
    // A listener that is no longer active has left the module's code, but may need the loader lock to end. The detach
    // holds that lock, so a wait would only time out. The listener may even be the thread that runs this detach.
    if (thread && statusThread.isActive() && WaitForSingleObject(thread.get(), kStatusThreadTimeoutMs) != WAIT_OBJECT_0)
        TerminateThread(thread.get(), 0);
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
    prepareExceptions();
    // Memory that runs out here costs the log only. No later step throws.
    guarded("log", [] { openLog(kLogLevel); });
    logInfo(L"Attaching to %ls", hostPath);
    setModuleInstance(instance);
    acquireShellAllocator();
    DisableThreadLibraryCalls(instance);
    setExclusionBuilder([](bool isFirst) { buildGraylist(!isFirst); });
    // Starts the watcher.
    getCurrentManifest();
    statusThread.start();
    isAttached = true;
}

void detachFromFileManager(bool processEnds)
{
    releaseShellAllocator();
    // At the end of a process the system has killed every other thread at an arbitrary instruction, perhaps inside a
    // lock of the heap, of a C stream or of GDI. It frees the rest without those locks.
    if (processEnds)
        return;
    freeMenuBitmaps();
    stopManifestWatcher();
    dropGraylist();
    statusThread.requestStop();
    stopStatusThread();
    freeTranslations();
    shutDownDatabaseLibrary();
    closeLog();
}

IMalloc* shellAllocator() noexcept
{
    return theShellAllocator;
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
    statusThread.start();
    resumeWatcher();
}

} // namespace tavi
