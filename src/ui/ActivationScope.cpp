#include "ui/ActivationScope.h"

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

} // namespace

ActivationScope::ActivationScope() noexcept
{
    // Created on first use, released when the module is unmapped.
    static const ContextHandle context(createModuleContext());
    active_ = context && ActivateActCtx(context.get(), &cookie_);
}

ActivationScope::~ActivationScope()
{
    if (active_)
        DeactivateActCtx(0, cookie_);
}

} // namespace tavi
