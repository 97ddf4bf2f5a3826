#include "shell/StubFolder.h"

#include <atomic>

#include "core/Boundary.h"
#include "shell/ClassIds.h"
#include "shell/ShellAllocator.h"

namespace tavi {
namespace {

constexpr ULONG kParsedAttributes = 0x01C43E88;

// The folder of the last Initialize, shared by all objects and freed with the module.
struct SharedFolder {
    std::atomic<PIDLIST_ABSOLUTE> items{nullptr};
    ~SharedFolder()
    {
        ILFree(items.exchange(nullptr));
    }
} sharedFolder;

HRESULT refuse(const char* entry) noexcept
{
    return guarded(entry, E_FAIL, [] { return E_FAIL; });
}

} // namespace

STDMETHODIMP StubFolder::QueryInterface(REFIID interfaceId, void** object)
{
    return guarded("StubFolder::QueryInterface", E_FAIL, [&]() -> HRESULT {
        if (!object)
            return E_POINTER;
        *object = nullptr;
        // IPersistFolder2 gets a table without GetCurFolder: callers that ask for it expect this answer.
        if (IsEqualIID(interfaceId, IID_IUnknown) || IsEqualIID(interfaceId, IID_IPersist) ||
            IsEqualIID(interfaceId, IID_IPersistFolder) || IsEqualIID(interfaceId, IID_IPersistFolder2))
            *object = static_cast<IPersistFolder*>(this);
        else if (IsEqualIID(interfaceId, IID_IShellFolder))
            *object = static_cast<IShellFolder*>(&folder_);
        else
            return E_NOINTERFACE;
        AddRef();
        return S_OK;
    });
}

STDMETHODIMP_(ULONG) StubFolder::AddRef()
{
    return guarded("StubFolder::AddRef", ULONG{1}, [&] { return ++references_; });
}

STDMETHODIMP_(ULONG) StubFolder::Release()
{
    return guarded("StubFolder::Release", ULONG{0}, [&] {
        const ULONG left = --references_;
        if (left == 0)
            delete this;
        return left;
    });
}

STDMETHODIMP StubFolder::GetClassID(CLSID* classId)
{
    return guarded("StubFolder::GetClassID", E_FAIL, [&]() -> HRESULT {
        if (!classId)
            return E_POINTER;
        *classId = kStubFolderClassId;
        return S_OK;
    });
}

STDMETHODIMP StubFolder::Initialize(PCIDLIST_ABSOLUTE folder)
{
    return guarded("StubFolder::Initialize", E_FAIL, [&] {
        ILFree(sharedFolder.items.exchange(folder ? ILClone(folder) : nullptr));
        return S_OK;
    });
}

StubFolder& StubFolder::Folder::owner() noexcept
{
    // A table pointer is all that this part has, directly behind the one of the whole object.
    static_assert(sizeof(Folder) == sizeof(void*));
    auto* const whole = reinterpret_cast<StubFolder*>(reinterpret_cast<void**>(this) - 1);
    return *whole;
}

STDMETHODIMP StubFolder::Folder::QueryInterface(REFIID interfaceId, void** object)
{
    return guarded("StubFolder::QueryInterface", E_FAIL, [&] { return owner().QueryInterface(interfaceId, object); });
}

STDMETHODIMP_(ULONG) StubFolder::Folder::AddRef()
{
    return guarded("StubFolder::AddRef", ULONG{1}, [&] { return owner().AddRef(); });
}

STDMETHODIMP_(ULONG) StubFolder::Folder::Release()
{
    return guarded("StubFolder::Release", ULONG{0}, [&] { return owner().Release(); });
}

STDMETHODIMP StubFolder::Folder::ParseDisplayName(HWND, IBindCtx*, LPWSTR, ULONG* eaten, PIDLIST_RELATIVE* items,
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

STDMETHODIMP StubFolder::Folder::EnumObjects(HWND, SHCONTF, IEnumIDList**)
{
    return refuse("StubFolder::EnumObjects");
}

STDMETHODIMP StubFolder::Folder::BindToObject(PCUIDLIST_RELATIVE, IBindCtx*, REFIID, void**)
{
    return refuse("StubFolder::BindToObject");
}

STDMETHODIMP StubFolder::Folder::BindToStorage(PCUIDLIST_RELATIVE, IBindCtx*, REFIID, void**)
{
    return refuse("StubFolder::BindToStorage");
}

STDMETHODIMP StubFolder::Folder::CompareIDs(LPARAM, PCUIDLIST_RELATIVE, PCUIDLIST_RELATIVE)
{
    return refuse("StubFolder::CompareIDs");
}

STDMETHODIMP StubFolder::Folder::CreateViewObject(HWND, REFIID, void**)
{
    return refuse("StubFolder::CreateViewObject");
}

STDMETHODIMP StubFolder::Folder::GetAttributesOf(UINT, PCUITEMID_CHILD_ARRAY, SFGAOF*)
{
    return refuse("StubFolder::GetAttributesOf");
}

STDMETHODIMP StubFolder::Folder::GetUIObjectOf(HWND, UINT, PCUITEMID_CHILD_ARRAY, REFIID, UINT*, void**)
{
    return refuse("StubFolder::GetUIObjectOf");
}

STDMETHODIMP StubFolder::Folder::GetDisplayNameOf(PCUITEMID_CHILD, SHGDNF, STRRET*)
{
    return refuse("StubFolder::GetDisplayNameOf");
}

STDMETHODIMP StubFolder::Folder::SetNameOf(HWND, PCUITEMID_CHILD, LPCWSTR, SHGDNF, PITEMID_CHILD*)
{
    return refuse("StubFolder::SetNameOf");
}

} // namespace tavi
