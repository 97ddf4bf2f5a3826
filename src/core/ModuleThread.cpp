#include "core/ModuleThread.h"

#include <memory>

#include <wx/private/threadinfo.h>

#include "core/Boundary.h"
#include "core/RuntimeCleanup.h"

namespace tavi {
namespace {

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

} // namespace

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
