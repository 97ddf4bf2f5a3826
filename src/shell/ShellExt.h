#pragma once

#include <windows.h>
#include <shlobj.h>

#include "core/Module.h"
#include "statedb/StateLookups.h"
#include "ui/Selection.h"

namespace tavi {

// The object that the file manager makes for a context menu. Used by the thread that made it only, so its count is
// plain. It also carries a property-sheet and an icon-overlay table, to which QueryInterface leads nobody: both are
// required so. The order of the bases is the order of the tables in the object.
class ShellExt final : public IShellPropSheetExt,
                       public IShellExtInit,
                       public IContextMenu,
                       public IShellIconOverlayIdentifier {
  public:
    // Throws DbException when the service's configuration database cannot be used.
    ShellExt();
    ShellExt(const ShellExt&) = delete;
    ShellExt& operator=(const ShellExt&) = delete;

    STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override;
    STDMETHODIMP_(ULONG) AddRef() override;
    STDMETHODIMP_(ULONG) Release() override;

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
    ~ShellExt();

    ULONG references_ = 0;
    PIDLIST_ABSOLUTE folder_ = nullptr;
    ModuleLock lock_;
    Selection selection_;
    FolderStateTable folderStates_;
    wxString modulePath_;
};

} // namespace tavi
