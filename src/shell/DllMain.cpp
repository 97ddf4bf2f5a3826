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
        // The loader keeps sending thread notifications, because the static C runtime has thread-local storage.
        if (reason == DLL_THREAD_ATTACH || reason == DLL_THREAD_DETACH)
            return TRUE;
        // A longer path is cut and has no terminator.
        wchar_t host[MAX_PATH + 1];
        if (GetModuleFileNameW(nullptr, host, MAX_PATH) == 0)
            return FALSE;
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

// The linker's entry point. At the end of a process it bypasses the C runtime, which would destroy static objects that
// killed threads were changing, and would wait for locks that those threads held.
//
// At attach the C runtime runs the constructor that chooses the stack protector's guard (core/StackProtector.c). This
// function is active then: if it had a guard, it would see it change.
extern "C" __attribute__((no_stack_protector)) BOOL WINAPI tavishellEntry(HINSTANCE instance, DWORD reason,
                                                                          LPVOID reserved)
{
    return reason == DLL_PROCESS_DETACH && reserved ? DllMain(instance, reason, reserved)
                                                    : DllMainCRTStartup(instance, reason, reserved);
}
