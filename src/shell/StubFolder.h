#pragma once

#include <windows.h>
#include <shlobj.h>

#include "core/Module.h"
#include "shell/ComObject.h"

namespace tavi {

// A shell folder that parses every name to the empty item id list and refuses every other operation. For others (see
// ARCHITECTURE.md): no registration of this module names it.
class RefusingFolder : public IShellFolder {
  public:
    STDMETHODIMP ParseDisplayName(HWND window, IBindCtx* context, LPWSTR name, ULONG* eaten, PIDLIST_RELATIVE* items,
                                  ULONG* attributes) final;
    STDMETHODIMP EnumObjects(HWND window, SHCONTF flags, IEnumIDList** list) final;
    STDMETHODIMP BindToObject(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId, void** object) final;
    STDMETHODIMP BindToStorage(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId, void** object) final;
    STDMETHODIMP CompareIDs(LPARAM order, PCUIDLIST_RELATIVE first, PCUIDLIST_RELATIVE second) final;
    STDMETHODIMP CreateViewObject(HWND owner, REFIID interfaceId, void** object) final;
    STDMETHODIMP GetAttributesOf(UINT count, PCUITEMID_CHILD_ARRAY items, SFGAOF* attributes) final;
    STDMETHODIMP GetUIObjectOf(HWND owner, UINT count, PCUITEMID_CHILD_ARRAY items, REFIID interfaceId, UINT* reserved,
                               void** object) final;
    STDMETHODIMP GetDisplayNameOf(PCUITEMID_CHILD item, SHGDNF flags, STRRET* name) final;
    STDMETHODIMP SetNameOf(HWND window, PCUITEMID_CHILD item, LPCWSTR name, SHGDNF flags, PITEMID_CHILD* renamed) final;
};

// The folder as a COM class of the module. Used only by the thread that created it.
//
// The first table must end after Initialize: the object answers IPersistFolder2 with it, and a caller that finds a
// GetCurFolder there would call it. The compiler appends the methods of a second interface that a class implements to
// its first table. Those of IShellFolder are therefore implemented by a base.
class StubFolder final : public ComObject<StubFolder, IPersistFolder, RefusingFolder> {
  public:
    static constexpr CLSID kClassId = {0x7d19e0b2, 0x5a63, 0x4f8e, {0x9c, 0x21, 0xb4, 0xe8, 0x7a, 0x0d, 0x3f, 0x56}};
    static constexpr InterfaceEntry kInterfaces[] = {
        {&IID_IUnknown, tableOf<IPersistFolder>},       {&IID_IPersist, tableOf<IPersistFolder>},
        {&IID_IPersistFolder, tableOf<IPersistFolder>}, {&IID_IPersistFolder2, tableOf<IPersistFolder>},
        {&IID_IShellFolder, tableOf<RefusingFolder>},
    };

    STDMETHODIMP GetClassID(CLSID* classId) override;
    STDMETHODIMP Initialize(PCIDLIST_ABSOLUTE folder) override;

  private:
    // Keeps the size of the object for those who know its layout; no operation reads it.
    [[maybe_unused]] std::int32_t unread_ = -1;
    ModuleLock lock_;
};

} // namespace tavi
