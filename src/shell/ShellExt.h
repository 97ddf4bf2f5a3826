#pragma once

#include <windows.h>
#include <shlobj.h>

#include "core/Handles.h"
#include "core/Module.h"
#include "shell/ComObject.h"
#include "statedb/StateLookups.h"
#include "ui/Selection.h"

namespace tavi {

// The object that the file manager creates for a context menu. Used only by the thread that created it.
//
// The property-sheet and icon-overlay tables are for others (see ARCHITECTURE.md), who take them by their places in the
// object. QueryInterface finds neither: a host that found them would add a page and badges that no registration of the
// module asks for.
class ShellExt final
    : public ComObject<ShellExt, IShellPropSheetExt, IShellExtInit, IContextMenu, IShellIconOverlayIdentifier> {
  public:
    static constexpr CLSID kClassId = {0x5e0c31a7, 0x8d42, 0x4b19, {0xa6, 0xf3, 0x2c, 0x7d, 0x90, 0xe1, 0xb8, 0x45}};
    static constexpr InterfaceEntry kInterfaces[] = {
        {&IID_IUnknown, tableOf<IShellPropSheetExt>},
        {&IID_IShellExtInit, tableOf<IShellExtInit>},
        {&IID_IContextMenu, tableOf<IContextMenu>},
    };

    // Throws DbException when the service's configuration database cannot be used.
    ShellExt();
    ~ShellExt();

    STDMETHODIMP AddPages(LPFNADDPROPSHEETPAGE addPage, LPARAM parameter) override;
    STDMETHODIMP ReplacePage(EXPPS pageId, LPFNADDPROPSHEETPAGE replacePage, LPARAM parameter) override;

    STDMETHODIMP Initialize(PCIDLIST_ABSOLUTE folder, IDataObject* data, HKEY progId) override;

    STDMETHODIMP QueryContextMenu(HMENU menu, UINT indexMenu, UINT firstId, UINT lastId, UINT flags) override;
    STDMETHODIMP InvokeCommand(LPCMINVOKECOMMANDINFO info) override;
    STDMETHODIMP GetCommandString(UINT_PTR offset, UINT type, UINT* reserved, LPSTR buffer, UINT size) override;

    STDMETHODIMP IsMemberOf(PCWSTR path, DWORD attributes) override;
    STDMETHODIMP GetOverlayInfo(PWSTR iconFile, int maxChars, int* index, DWORD* flags) override;
    STDMETHODIMP GetPriority(int* priority) override;

  private:
    ItemIdList folder_;
    ModuleLock lock_;
    Selection selection_;
    FolderStateTable folderStates_;
    wxString modulePath_;
};

} // namespace tavi
