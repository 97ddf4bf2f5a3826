#include "core/Module.h"

#include <exception>
#include <memory>
#include <utility>

#include <shlobj.h>
#include <wx/private/threadinfo.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/ThreadLocals.h"

// Of the C++ runtime, which declares it in no header.
namespace __gnu_cxx { // NOLINT(bugprone-reserved-identifier)
void __freeres();     // NOLINT(bugprone-reserved-identifier)
} // namespace __gnu_cxx

namespace tavi {
namespace {

std::atomic<HINSTANCE> theInstance{nullptr};
std::atomic<IMalloc*> theAllocator{nullptr};
std::atomic<std::int32_t> theRefCount{0};

struct ThreadStart {
    ThreadBody body;
    void* argument;
    // The mapping that the thread runs in; null in a program that is not loaded and freed as a module.
    HMODULE mapping;
};

DWORD WINAPI runModuleThread(void* parameter)
{
    ThreadStart start{};
    guarded("module thread", [&] {
        std::unique_ptr<ThreadStart> owned(static_cast<ThreadStart*>(parameter));
        start = *owned;
        owned.reset();
        start.body(start.argument);
    });
    // The library keeps texts for each thread that it has translated for or logged from, and frees those of its own
    // only.
    guarded("thread clean-up", [] { wxThreadSpecificInfo::ThreadCleanUp(); });
    releaseThreadRuntime();
    // A plain return would run through code that this very release may unmap.
    FreeLibraryAndExitThread(start.mapping, 0);
}

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

HINSTANCE moduleInstance() noexcept
{
    return theInstance;
}

void setModuleInstance(HINSTANCE instance) noexcept
{
    theInstance = instance;
}

IMalloc* shellAllocator() noexcept
{
    return theAllocator;
}

void acquireShellAllocator() noexcept
{
    IMalloc* allocator = nullptr;
    if (SUCCEEDED(SHGetMalloc(&allocator)))
        theAllocator = allocator;
}

void releaseShellAllocator() noexcept
{
    if (IMalloc* allocator = theAllocator.exchange(nullptr))
        allocator->Release();
}

std::atomic<std::int32_t>& moduleRefCount() noexcept
{
    return theRefCount;
}

void releaseThreadRuntime() noexcept
{
    // The runtime's part holds the exceptions in flight: a handler further up would read freed memory.
    if (std::uncaught_exceptions() != 0 || std::current_exception())
        return;
    HMODULE module = nullptr;
    if (!GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
                            reinterpret_cast<const wchar_t*>(&runModuleThread), &module))
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

HANDLE startModuleThread(ThreadBody body, void* argument, bool suspended) noexcept
{
    return guarded("thread start", static_cast<HANDLE>(nullptr), [&]() -> HANDLE {
        auto start = std::make_unique<ThreadStart>(ThreadStart{body, argument, nullptr});
        if (!GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS,
                                reinterpret_cast<const wchar_t*>(&runModuleThread), &start->mapping))
            return nullptr;
        const HMODULE mapping = start->mapping;
        HANDLE thread =
            CreateThread(nullptr, 0, runModuleThread, start.get(), suspended ? CREATE_SUSPENDED : 0, nullptr);
        if (thread)
            static_cast<void>(start.release());
        else
            FreeLibrary(mapping);
        return thread;
    });
}

} // namespace tavi
