#include "core/RuntimeCleanup.h"

#include <exception>

#include <windows.h>

#include "core/ThreadLocals.h"

// A function of the C++ runtime that no header declares: frees the memory that it reserves for exceptions.
namespace __gnu_cxx { // NOLINT(bugprone-reserved-identifier)
void __freeres();     // NOLINT(bugprone-reserved-identifier)
} // namespace __gnu_cxx

namespace tavi {
namespace {

// Constructed before every other static object and so destroyed after them, when the module is unmapped. For the thread
// that unloads the module the loader does not run the runtime's clean-up, and the runtime never frees the memory that
// it reserves for exceptions when none is left.
struct LastRelease {
    ~LastRelease()
    {
        releaseThreadRuntime();
        releaseAllThreadLocals();
        __gnu_cxx::__freeres();
    }
};
[[gnu::init_priority(101)]] const LastRelease lastRelease;

} // namespace

void releaseThreadRuntime() noexcept
{
    // The runtime's data of a thread include its exceptions. One that is still being handled would be freed too early.
    if (std::uncaught_exceptions() != 0 || std::current_exception())
        return;
    HMODULE module = nullptr;
    if (!GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
                            reinterpret_cast<const wchar_t*>(&releaseThreadRuntime), &module))
        return;
    // The runtime frees a thread's data in callbacks that the loader runs when the thread ends. It cannot run those of
    // a module that is unmapped by then, so they run here.
    const auto* const base = reinterpret_cast<const BYTE*>(module);
    const auto* const dos = reinterpret_cast<const IMAGE_DOS_HEADER*>(base);
    const auto* const headers = reinterpret_cast<const IMAGE_NT_HEADERS*>(base + dos->e_lfanew);
    const IMAGE_DATA_DIRECTORY& entry = headers->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_TLS];
    if (entry.VirtualAddress == 0)
        return;
    const auto* const tls = reinterpret_cast<const IMAGE_TLS_DIRECTORY*>(base + entry.VirtualAddress);
    const auto* callback = reinterpret_cast<const PIMAGE_TLS_CALLBACK*>(tls->AddressOfCallBacks);
    for (; callback && *callback; ++callback)
        (*callback)(module, DLL_THREAD_DETACH, nullptr);
}

} // namespace tavi
