#include "shell/ShellExt.h"

#include <vector>

#include <strsafe.h>

#include "core/Boundary.h"
#include "manifest/CurrentManifest.h"
#include "ui/ContextMenu.h"
#include "ui/PropertyPage.h"

namespace tavi {
namespace {

// The place of TAVI_ICON_OVERLAY among the module's icons.
constexpr int kOverlayIconIndex = 3;
// The shell shows the badge of the lowest number; 100 is the maximum.
constexpr int kOverlayPriority = 99;
// The only file state with a badge.
constexpr std::int32_t kOverlayState = 1;
constexpr std::size_t kFirstPathChars = 264;
constexpr std::size_t kPathStepChars = 4;

// Returns 0 or the system's error code.
DWORD readModulePath(wxString& path)
{
    std::vector<wchar_t> buffer(kFirstPathChars);
    for (;;) {
        SetLastError(ERROR_SUCCESS);
        const DWORD length = GetModuleFileNameW(moduleInstance(), buffer.data(), static_cast<DWORD>(buffer.size()));
        const DWORD error = GetLastError();
        if (error != ERROR_INSUFFICIENT_BUFFER) {
            path.assign(buffer.data(), length);
            return length == 0 ? error : ERROR_SUCCESS;
        }
        buffer.resize(buffer.size() + kPathStepChars);
    }
}

} // namespace

ShellExt::ShellExt() = default;

ShellExt::~ShellExt()
{
    // Before the destruction of the lock, after which COM may unload the module.
    folder_.reset();
}

STDMETHODIMP ShellExt::AddPages(LPFNADDPROPSHEETPAGE addPage, LPARAM parameter)
{
    guarded("ShellExt::AddPages", [&] { addPropertyPage(selection_, getCurrentManifest(), addPage, parameter); });
    return S_OK;
}

STDMETHODIMP ShellExt::ReplacePage(EXPPS, LPFNADDPROPSHEETPAGE, LPARAM)
{
    return E_FAIL;
}

STDMETHODIMP ShellExt::Initialize(PCIDLIST_ABSOLUTE folder, IDataObject* data, HKEY)
{
    // Items that cannot be captured are left out. After an error the host would leave out the whole menu.
    guarded("ShellExt::Initialize", [&] {
        folder_.reset(folder ? ILClone(folder) : nullptr);
        captureSelection(folder_.get(), data, folderStates_, selection_);
    });
    return S_OK;
}

STDMETHODIMP ShellExt::QueryContextMenu(HMENU menu, UINT indexMenu, UINT firstId, UINT, UINT flags)
{
    return guarded("ShellExt::QueryContextMenu", MAKE_HRESULT(SEVERITY_SUCCESS, 0, 0), [&]() -> HRESULT {
        return MAKE_HRESULT(SEVERITY_SUCCESS, 0, insertMenuItems(menu, indexMenu, firstId, flags, selection_));
    });
}

STDMETHODIMP ShellExt::InvokeCommand(LPCMINVOKECOMMANDINFO info)
{
    return guarded("ShellExt::InvokeCommand", E_FAIL,
                   [&] { return info ? invokeCommand(*info, selection_) : E_INVALIDARG; });
}

STDMETHODIMP ShellExt::GetCommandString(UINT_PTR offset, UINT type, UINT*, LPSTR buffer, UINT size)
{
    return guarded("ShellExt::GetCommandString", E_FAIL,
                   [&] { return commandString(offset, type, buffer, size, selection_); });
}

STDMETHODIMP ShellExt::IsMemberOf(PCWSTR path, DWORD)
{
    return guarded("ShellExt::IsMemberOf", S_FALSE, [&] {
        FileStateLookup lookup;
        return path && lookup.getFileState(path) == kOverlayState ? S_OK : S_FALSE;
    });
}

STDMETHODIMP ShellExt::GetOverlayInfo(PWSTR iconFile, int maxChars, int* index, DWORD* flags)
{
    return guarded("ShellExt::GetOverlayInfo", E_FAIL, [&]() -> HRESULT {
        if (!iconFile || !index || !flags)
            return E_INVALIDARG;
        if (modulePath_.empty()) {
            const DWORD error = readModulePath(modulePath_);
            if (modulePath_.empty())
                return static_cast<HRESULT>(error);
        }
        // As an unsigned number a negative count is above the maximum that the copy accepts.
        const HRESULT copied = StringCchCopyW(iconFile, static_cast<unsigned>(maxChars), modulePath_.wc_str());
        if (FAILED(copied))
            return copied;
        *index = kOverlayIconIndex;
        *flags = ISIOI_ICONFILE | ISIOI_ICONINDEX;
        return S_OK;
    });
}

STDMETHODIMP ShellExt::GetPriority(int* priority)
{
    return guarded("ShellExt::GetPriority", E_FAIL, [&]() -> HRESULT {
        if (!priority)
            return E_INVALIDARG;
        *priority = kOverlayPriority;
        return S_OK;
    });
}

} // namespace tavi
