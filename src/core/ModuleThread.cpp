#include "core/ModuleThread.h"

#include <exception>
#include <memory>

#include <wx/private/threadinfo.h>

#include "core/Boundary.h"
#include "core/RuntimeCleanup.h"

namespace tavi {
namespace {

struct ThreadStart {
    ThreadBody body;
    void* argument;
    // The module's reference to itself, which the thread releases as it ends.
    HMODULE mapping;
};

DWORD WINAPI runModuleThread(void* parameter)
{
    ThreadStart start{};
    guarded("module thread", [&] {
        // Makes the C++ runtime allocate its data for this thread now, not at the first exception, which may be that
        // memory has run out.
        static_cast<void>(std::current_exception());
        std::unique_ptr<ThreadStart> owned(static_cast<ThreadStart*>(parameter));
        start = *owned;
        owned.reset();
        start.body(start.argument);
    });
    // wxWidgets keeps texts for each thread that translated or logged, and frees them only for threads of its own.
    guarded("thread clean-up", [] { wxThreadSpecificInfo::ThreadCleanUp(); });
    releaseThreadRuntime();
    // This release may unmap the module, so the thread cannot return into it.
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
