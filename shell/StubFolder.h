#pragma once

#include <windows.h>
#include <shlobj.h>

#include "core/Module.h"

namespace tavi {

// A shell folder that parses any name to the empty item list and refuses everything else. Used by the thread that made
// it only.
class StubFolder final : public IPersistFolder, public IShellFolder {
  public:
    StubFolder() = default;
    StubFolder(const StubFolder&) = delete;
    StubFolder& operator=(const StubFolder&) = delete;

    STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override;
    STDMETHODIMP_(ULONG) AddRef() override;
    STDMETHODIMP_(ULONG) Release() override;

    STDMETHODIMP GetClassID(CLSID* classId) override;
    STDMETHODIMP Initialize(PCIDLIST_ABSOLUTE folder) override;

    STDMETHODIMP ParseDisplayName(HWND window, IBindCtx* context, LPWSTR name, ULONG* eaten, PIDLIST_RELATIVE* items,
                                  ULONG* attributes) override;
    STDMETHODIMP EnumObjects(HWND window, SHCONTF flags, IEnumIDList** list) override;
    STDMETHODIMP BindToObject(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId, void** object) override;
    STDMETHODIMP BindToStorage(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId, void** object) override;
    STDMETHODIMP CompareIDs(LPARAM order, PCUIDLIST_RELATIVE first, PCUIDLIST_RELATIVE second) override;
    STDMETHODIMP CreateViewObject(HWND owner, REFIID interfaceId, void** object) override;
    STDMETHODIMP GetAttributesOf(UINT count, PCUITEMID_CHILD_ARRAY items, SFGAOF* attributes) override;
    STDMETHODIMP GetUIObjectOf(HWND owner, UINT count, PCUITEMID_CHILD_ARRAY items, REFIID interfaceId, UINT* reserved,
                               void** object) override;
    STDMETHODIMP GetDisplayNameOf(PCUITEMID_CHILD item, SHGDNF flags, STRRET* name) override;
    STDMETHODIMP SetNameOf(HWND window, PCUITEMID_CHILD item, LPCWSTR name, SHGDNF flags,
                           PITEMID_CHILD* renamed) override;

  private:
    ~StubFolder() = default;

    ULONG references_ = 0;
    // Required in the object, though no operation reads it.
    [[maybe_unused]] std::int32_t unread_ = -1;
    ModuleLock lock_;
};

} // namespace tavi
