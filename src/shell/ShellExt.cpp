#include "shell/ShellExt.h"

#include <algorithm>
#include <vector>

#include <strsafe.h>

#include "manifest/CurrentManifest.h"
#include "core/Boundary.h"
#include "core/Handles.h"
#include "ui/ContextMenu.h"
#include "ui/PropertyPage.h"

namespace tavi {
namespace {

constexpr int kOverlayIconIndex = 3;
constexpr int kOverlayPriority = 99;
constexpr std::int32_t kOverlayState = 1;
constexpr std::size_t kFirstPathBuffer = 264;
constexpr std::size_t kPathBufferStep = 4;

// 0, or the system's error.
DWORD readModulePath(wxString& path)
{
    std::vector<wchar_t> buffer(kFirstPathBuffer);
    for (;;) {
        SetLastError(ERROR_SUCCESS);
        const DWORD length = GetModuleFileNameW(moduleInstance(), buffer.data(), static_cast<DWORD>(buffer.size()));
        const DWORD error = GetLastError();
        if (error != ERROR_INSUFFICIENT_BUFFER) {
            path.assign(buffer.data(), length);
            return length == 0 ? error : ERROR_SUCCESS;
        }
        buffer.resize(buffer.size() + kPathBufferStep);
    }
}

} // namespace

ShellExt::ShellExt() = default;

ShellExt::~ShellExt()
{
    ILFree(folder_);
}

STDMETHODIMP ShellExt::QueryInterface(REFIID interfaceId, void** object)
{
    return guarded("ShellExt::QueryInterface", E_FAIL, [&]() -> HRESULT {
        if (!object)
            return E_POINTER;
        *object = nullptr;
        if (IsEqualIID(interfaceId, IID_IUnknown))
            *object = static_cast<IShellPropSheetExt*>(this);
        else if (IsEqualIID(interfaceId, IID_IShellExtInit))
            *object = static_cast<IShellExtInit*>(this);
        else if (IsEqualIID(interfaceId, IID_IContextMenu))
            *object = static_cast<IContextMenu*>(this);
        else
            return E_NOINTERFACE;
        AddRef();
        return S_OK;
    });
}

STDMETHODIMP_(ULONG) ShellExt::AddRef()
{
    return guarded("ShellExt::AddRef", ULONG{1}, [&] { return ++references_; });
}

STDMETHODIMP_(ULONG) ShellExt::Release()
{
    return guarded("ShellExt::Release", ULONG{0}, [&] {
        const ULONG left = --references_;
        if (left == 0)
            delete this;
        return left;
    });
}

STDMETHODIMP ShellExt::AddPages(LPFNADDPROPSHEETPAGE addPage, LPARAM parameter)
{
    guarded("ShellExt::AddPages", [&] { addPropertyPage(selection_, getCurrentManifest(), addPage, parameter); });
    return S_OK;
}

STDMETHODIMP ShellExt::ReplacePage(EXPPS, LPFNADDPROPSHEETPAGE, LPARAM)
{
    return guarded("ShellExt::ReplacePage", E_FAIL, [] { return E_FAIL; });
}

STDMETHODIMP ShellExt::Initialize(PCIDLIST_ABSOLUTE folder, IDataObject* data, HKEY)
{
    // Whatever could not be captured is left out; the shell is told that all is well.
    guarded("ShellExt::Initialize", [&] {
        ILFree(std::exchange(folder_, nullptr));
        if (folder)
            folder_ = ILClone(folder);
        captureSelection(folder_, data, folderStates_, selection_);
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
        // A negative count is one above the largest that the copy accepts.
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
