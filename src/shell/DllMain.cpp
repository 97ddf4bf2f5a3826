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

extern "C" BOOL WINAPI DllMainCRTStartup(HINSTANCE instance, DWORD reason, LPVOID reserved);
extern "C" BOOL WINAPI tavishellEntry(HINSTANCE instance, DWORD reason, LPVOID reserved);

// The entry that the linker is given. At the end of a process it bypasses the C runtime, which would destroy the static
// objects of a module whose threads were killed at arbitrary instructions, and would wait for the locks that they held.
// At attach the runtime chooses the stack protector's cookie, so this function must not check one.
extern "C" __attribute__((no_stack_protector)) BOOL WINAPI tavishellEntry(HINSTANCE instance, DWORD reason,
                                                                          LPVOID reserved)
{
    return reason == DLL_PROCESS_DETACH && reserved ? DllMain(instance, reason, reserved)
                                                    : DllMainCRTStartup(instance, reason, reserved);
}
