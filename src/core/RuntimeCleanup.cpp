#include "core/RuntimeCleanup.h"

#include <exception>

#include <windows.h>

#include "core/ThreadLocals.h"

// Of the C++ runtime, which declares it in no header.
namespace __gnu_cxx { // NOLINT(bugprone-reserved-identifier)
void __freeres();     // NOLINT(bugprone-reserved-identifier)
} // namespace __gnu_cxx

namespace tavi {
namespace {

// Created before every other object and so destroyed after them all, when the module is unmapped. The loader no longer
// runs the runtime's clean-up for the thread that unloads the module, and the runtime never frees its reserve for
// exceptions when memory has run out.
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
    // The runtime's part holds the exceptions in flight: a handler further up would read freed memory.
    if (std::uncaught_exceptions() != 0 || std::current_exception())
        return;
    HMODULE module = nullptr;
    if (!GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
                            reinterpret_cast<const wchar_t*>(&releaseThreadRuntime), &module))
        return;
    // The runtime frees a thread's part in the callbacks that the loader runs as the thread ends, which it does not do
    // for a module that is gone by then.
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
