#include <iterator>

#include <windows.h>

#include "core/Boundary.h"
#include "core/Module.h"
#include "shell/Lifecycle.h"

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID);

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID reserved)
{
    using namespace tavi;
    return guarded("DllMain", BOOL{TRUE}, [&]() -> BOOL {
        // Thread notifications keep coming, since the static runtime brings thread-local storage: pass them before the
        // gate.
        if (reason == DLL_THREAD_ATTACH || reason == DLL_THREAD_DETACH)
            return TRUE;
        // A longer path is cut, which leaves it without a terminator.
        wchar_t host[MAX_PATH + 1];
        GetModuleFileNameW(nullptr, host, MAX_PATH);
        host[MAX_PATH] = L'\0';
        const HostKind kind = hostKindOf(host);
        if (kind == HostKind::refused)
            return FALSE;
        if (reason == DLL_PROCESS_ATTACH) {
            if (kind == HostKind::fileManager)
                attachToFileManager(instance, host);
            else
                setModuleInstance(instance);
        } else if (reason == DLL_PROCESS_DETACH && kind == HostKind::fileManager) {
            detachFromFileManager(reserved != nullptr);
        }
        return TRUE;
    });
}
