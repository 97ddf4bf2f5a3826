#include "shell/ClassFactory.h"

#include <new>

#include <wx/log.h>

#include "core/Boundary.h"
#include "core/Module.h"
#include "shell/ClassIds.h"
#include "shell/ShellExt.h"
#include "shell/StubFolder.h"
#include "statedb/Database.h"

namespace tavi {
namespace {

// Factories count plainly, not atomically: the shell asks for them one at a time.
void countPlainly(int change) noexcept
{
    auto& count = moduleRefCount();
    count.store(count.load(std::memory_order_relaxed) + change, std::memory_order_relaxed);
}

template <class Object>
IUnknown* primary(Object* object);

template <>
IUnknown* primary(ShellExt* object)
{
    return static_cast<IShellPropSheetExt*>(object);
}

template <>
IUnknown* primary(StubFolder* object)
{
    return static_cast<IPersistFolder*>(object);
}

template <class Object>
class ClassFactory final : public IClassFactory {
  public:
    ClassFactory()
    {
        countPlainly(1);
    }
    ClassFactory(const ClassFactory&) = delete;
    ClassFactory& operator=(const ClassFactory&) = delete;
    virtual ~ClassFactory()
    {
        countPlainly(-1);
    }

    STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override
    {
        return guarded("ClassFactory::QueryInterface", E_FAIL, [&]() -> HRESULT {
            if (!object)
                return E_POINTER;
            *object = nullptr;
            if (!IsEqualIID(interfaceId, IID_IUnknown) && !IsEqualIID(interfaceId, IID_IClassFactory))
                return E_NOINTERFACE;
            *object = static_cast<IClassFactory*>(this);
            AddRef();
            return S_OK;
        });
    }

    STDMETHODIMP_(ULONG) AddRef() override
    {
        return guarded("ClassFactory::AddRef", ULONG{1}, [&] { return ++references_; });
    }

    STDMETHODIMP_(ULONG) Release() override
    {
        return guarded("ClassFactory::Release", ULONG{0}, [&] {
            const ULONG left = --references_;
            if (left == 0)
                delete this;
            return left;
        });
    }

    STDMETHODIMP CreateInstance(IUnknown* outer, REFIID interfaceId, void** object) override
    {
        return guarded("ClassFactory::CreateInstance", E_FAIL, [&]() -> HRESULT {
            if (!object)
                return E_POINTER;
            *object = nullptr;
            if (outer)
                return CLASS_E_NOAGGREGATION;
            try {
                IUnknown* const made = primary(new Object);
                made->AddRef();
                const HRESULT result = made->QueryInterface(interfaceId, object);
                made->Release();
                return result;
            } catch (const std::bad_alloc&) {
                return E_OUTOFMEMORY;
            } catch (const DbException& error) {
                wxLogError("Failed to open folder-state db (%d: %s)", error.code(), error.message());
                return E_FAIL;
            }
        });
    }

    STDMETHODIMP LockServer(BOOL) override
    {
        return guarded("ClassFactory::LockServer", E_FAIL, [] { return S_OK; });
    }

  private:
    ULONG references_ = 0;
};

template <class Object>
IClassFactory* makeFactory()
{
    auto* const factory = new ClassFactory<Object>;
    factory->AddRef();
    return factory;
}

} // namespace

IClassFactory* makeClassFactory(REFCLSID classId)
{
    if (IsEqualCLSID(classId, kShellExtClassId))
        return makeFactory<ShellExt>();
    if (IsEqualCLSID(classId, kStubFolderClassId))
        return makeFactory<StubFolder>();
    return nullptr;
}

} // namespace tavi
