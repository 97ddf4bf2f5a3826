#include "ui/ActivationScope.h"

#include <atomic>

#include "core/Handles.h"
#include "core/InitializeOnce.h"
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

ContextHandle createModuleContext() noexcept
{
    // Windows needs the path beside the handle. Without a context the host's controls are used.
    wchar_t path[MAX_PATH];
    const DWORD length = GetModuleFileNameW(moduleInstance(), path, MAX_PATH);
    if (length == 0 || length >= MAX_PATH)
        return {};
    ACTCTXW request{};
    request.cbSize = sizeof(request);
    request.dwFlags = ACTCTX_FLAG_HMODULE_VALID | ACTCTX_FLAG_RESOURCE_NAME_VALID;
    request.lpSource = path;
    request.lpResourceName = MAKEINTRESOURCEW(TAVI_MANIFEST);
    request.hModule = moduleInstance();
    return ContextHandle(CreateActCtxW(&request));
}

// Released when the module is unmapped.
struct ModuleContext {
    std::atomic<HANDLE> context{INVALID_HANDLE_VALUE};
    ~ModuleContext()
    {
        const ContextHandle released(context);
    }
} moduleContext;

} // namespace

ActivationScope::ActivationScope() noexcept
{
    const HANDLE context = initializeOnce(moduleContext.context, createModuleContext);
    active_ = context != INVALID_HANDLE_VALUE && ActivateActCtx(context, &cookie_);
}

ActivationScope::~ActivationScope()
{
    if (active_)
        DeactivateActCtx(0, cookie_);
}

} // namespace tavi
