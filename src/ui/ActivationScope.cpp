#include "ui/ActivationScope.h"

#include <atomic>

#include "core/Handles.h"
#include "core/Module.h"
#include "ui/resource.h"

namespace tavi {
namespace {

struct ContextTraits : InvalidIsNone {
    static void free(Handle context) noexcept
    {
        ReleaseActCtx(context);
    }
};
using ContextHandle = UniqueHandle<ContextTraits>;

HANDLE createModuleContext() noexcept
{
    // The kernel needs the path beside the handle. Without a context the host's controls are used.
    wchar_t path[MAX_PATH];
    const DWORD length = GetModuleFileNameW(moduleInstance(), path, MAX_PATH);
    if (length == 0 || length >= MAX_PATH)
        return INVALID_HANDLE_VALUE;
    ACTCTXW request{};
    request.cbSize = sizeof(request);
    request.dwFlags = ACTCTX_FLAG_HMODULE_VALID | ACTCTX_FLAG_RESOURCE_NAME_VALID;
    request.lpSource = path;
    request.lpResourceName = MAKEINTRESOURCEW(TAVI_MANIFEST);
    request.hModule = moduleInstance();
    return CreateActCtxW(&request);
}

// Created on first use, released when the module is unmapped. Not a local static: threads that meet in the guard of one
// make the C++ runtime create two semaphores and an event, which would outlive the module. Here both create a context,
// and one of the two is kept.
class ModuleContext {
  public:
    ~ModuleContext()
    {
        const ContextHandle released(context_);
    }
    HANDLE get() noexcept
    {
        HANDLE context = context_;
        if (context != INVALID_HANDLE_VALUE)
            return context;
        ContextHandle created(createModuleContext());
        return context_.compare_exchange_strong(context, created.get()) ? created.release() : context;
    }

  private:
    std::atomic<HANDLE> context_{INVALID_HANDLE_VALUE};
};
ModuleContext moduleContext;

} // namespace

ActivationScope::ActivationScope() noexcept
{
    const HANDLE context = moduleContext.get();
    active_ = context != INVALID_HANDLE_VALUE && ActivateActCtx(context, &cookie_);
}

ActivationScope::~ActivationScope()
{
    if (active_)
        DeactivateActCtx(0, cookie_);
}

} // namespace tavi
