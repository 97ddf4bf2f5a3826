#include "shell/StubFolder.h"

#include <atomic>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "shell/Lifecycle.h"

namespace tavi {
namespace {

constexpr ULONG kParsedAttributes = 0x01C43E88;

// The folder of the last Initialize, shared by all objects and freed with the module.
struct SharedFolder {
    std::atomic<PIDLIST_ABSOLUTE> items{nullptr};

    void set(PIDLIST_ABSOLUTE replacement) noexcept
    {
        const ItemIdList previous(items.exchange(replacement));
    }
    ~SharedFolder()
    {
        set(nullptr);
    }
} sharedFolder;

} // namespace

STDMETHODIMP StubFolder::GetClassID(CLSID* classId)
{
    return guarded("StubFolder::GetClassID", E_FAIL, [&]() -> HRESULT {
        if (!classId)
            return E_POINTER;
        *classId = kClassId;
        return S_OK;
    });
}

STDMETHODIMP StubFolder::Initialize(PCIDLIST_ABSOLUTE folder)
{
    return guarded("StubFolder::Initialize", E_FAIL, [&] {
        sharedFolder.set(folder ? ILClone(folder) : nullptr);
        return S_OK;
    });
}

STDMETHODIMP RefusingFolder::ParseDisplayName(HWND, IBindCtx*, LPWSTR, ULONG* eaten, PIDLIST_RELATIVE* items,
                                              ULONG* attributes)
{
    return guarded("StubFolder::ParseDisplayName", E_FAIL, [&]() -> HRESULT {
        if (!items)
            return E_INVALIDARG;
        *items = nullptr;
        IMalloc* const allocator = shellAllocator();
        void* const empty = allocator ? allocator->Alloc(sizeof(USHORT)) : nullptr;
        if (!empty)
            return E_OUTOFMEMORY;
        *static_cast<USHORT*>(empty) = 0;
        *items = static_cast<PIDLIST_RELATIVE>(empty);
        if (eaten)
            *eaten = 0;
        if (attributes)
            *attributes &= kParsedAttributes;
        return S_OK;
    });
}

STDMETHODIMP RefusingFolder::EnumObjects(HWND, SHCONTF, IEnumIDList**)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::BindToObject(PCUIDLIST_RELATIVE, IBindCtx*, REFIID, void**)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::BindToStorage(PCUIDLIST_RELATIVE, IBindCtx*, REFIID, void**)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::CompareIDs(LPARAM, PCUIDLIST_RELATIVE, PCUIDLIST_RELATIVE)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::CreateViewObject(HWND, REFIID, void**)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::GetAttributesOf(UINT, PCUITEMID_CHILD_ARRAY, SFGAOF*)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::GetUIObjectOf(HWND, UINT, PCUITEMID_CHILD_ARRAY, REFIID, UINT*, void**)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::GetDisplayNameOf(PCUITEMID_CHILD, SHGDNF, STRRET*)
{
    return E_FAIL;
}

STDMETHODIMP RefusingFolder::SetNameOf(HWND, PCUITEMID_CHILD, LPCWSTR, SHGDNF, PITEMID_CHILD*)
{
    return E_FAIL;
}

} // namespace tavi
