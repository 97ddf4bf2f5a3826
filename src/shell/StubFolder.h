#pragma once

#include <windows.h>
#include <shlobj.h>

#include "core/Module.h"

namespace tavi {

// A shell folder that parses any name to the empty item list and refuses everything else. Used by the thread that
// created it only.
//
// The folder table is a member, not a base: with two bases the compiler appends the second table's methods to the first
// one, where a caller of IPersistFolder2 would find ParseDisplayName in the place of GetCurFolder.
class StubFolder final : public IPersistFolder {
  public:
    StubFolder() = default;
    StubFolder(const StubFolder&) = delete;
    StubFolder& operator=(const StubFolder&) = delete;

    STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override;
    STDMETHODIMP_(ULONG) AddRef() override;
    STDMETHODIMP_(ULONG) Release() override;

    STDMETHODIMP GetClassID(CLSID* classId) override;
    STDMETHODIMP Initialize(PCIDLIST_ABSOLUTE folder) override;

  private:
    // The second interface table. Counts and answers as the object that it is part of.
    class Folder final : public IShellFolder {
      public:
        Folder() = default;
        Folder(const Folder&) = delete;
        Folder& operator=(const Folder&) = delete;

        STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override;
        STDMETHODIMP_(ULONG) AddRef() override;
        STDMETHODIMP_(ULONG) Release() override;

        STDMETHODIMP ParseDisplayName(HWND window, IBindCtx* context, LPWSTR name, ULONG* eaten,
                                      PIDLIST_RELATIVE* items, ULONG* attributes) override;
        STDMETHODIMP EnumObjects(HWND window, SHCONTF flags, IEnumIDList** list) override;
        STDMETHODIMP BindToObject(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId,
                                  void** object) override;
        STDMETHODIMP BindToStorage(PCUIDLIST_RELATIVE item, IBindCtx* context, REFIID interfaceId,
                                   void** object) override;
        STDMETHODIMP CompareIDs(LPARAM order, PCUIDLIST_RELATIVE first, PCUIDLIST_RELATIVE second) override;
        STDMETHODIMP CreateViewObject(HWND owner, REFIID interfaceId, void** object) override;
        STDMETHODIMP GetAttributesOf(UINT count, PCUITEMID_CHILD_ARRAY items, SFGAOF* attributes) override;
        STDMETHODIMP GetUIObjectOf(HWND owner, UINT count, PCUITEMID_CHILD_ARRAY items, REFIID interfaceId,
                                   UINT* reserved, void** object) override;
        STDMETHODIMP GetDisplayNameOf(PCUITEMID_CHILD item, SHGDNF flags, STRRET* name) override;
        STDMETHODIMP SetNameOf(HWND window, PCUITEMID_CHILD item, LPCWSTR name, SHGDNF flags,
                               PITEMID_CHILD* renamed) override;

      private:
        StubFolder& owner() noexcept;
    };

    ~StubFolder() = default;

    Folder folder_;
    ULONG references_ = 0;
    // No operation reads it; the object's layout has it.
    [[maybe_unused]] std::int32_t unread_ = -1;
    ModuleLock lock_;
};

} // namespace tavi
