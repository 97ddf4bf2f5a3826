#include "shell/ClassFactory.h"

#include <new>

#include "core/Boundary.h"
#include "core/LogLine.h"
#include "core/Module.h"
#include "shell/ComObject.h"
#include "shell/ShellExt.h"
#include "shell/StubFolder.h"
#include "statedb/Database.h"

namespace tavi {
namespace {

// Two steps, not an atomic one: a change that another thread makes between them is lost. Then the module stays loaded,
// or is unloaded while an object lives. It takes two threads of the host that use factories at the same instant.
void countPlainly(int change) noexcept
{
    auto& count = moduleRefCount();
    count.store(count.load(std::memory_order_relaxed) + change, std::memory_order_relaxed);
}

template <class Object>
class ClassFactory final : public ComObject<ClassFactory<Object>, IClassFactory> {
    using Base = ComObject<ClassFactory, IClassFactory>;

  public:
    static constexpr typename Base::InterfaceEntry kInterfaces[] = {
        {&IID_IUnknown, Base::template tableOf<IClassFactory>},
        {&IID_IClassFactory, Base::template tableOf<IClassFactory>},
    };

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

    STDMETHODIMP CreateInstance(IUnknown* outer, REFIID interfaceId, void** object) override
    {
        return guarded("ClassFactory::CreateInstance", E_FAIL, [&]() -> HRESULT {
            if (!object)
                return E_POINTER;
            *object = nullptr;
            if (outer)
                return CLASS_E_NOAGGREGATION;
            try {
                const RefPtr<IUnknown> created(Object::unknown(new Object));
                return created->QueryInterface(interfaceId, object);
            } catch (const std::bad_alloc&) {
                return E_OUTOFMEMORY;
            } catch (const DbException& error) {
                logError(L"Failed to open folder-state db (%d: %ls)", error.code(), error.message().wc_str());
                return E_FAIL;
            }
        });
    }

    STDMETHODIMP LockServer(BOOL) override
    {
        return S_OK;
    }
};

} // namespace

RefPtr<IClassFactory> makeClassFactory(REFCLSID classId)
{
    if (IsEqualCLSID(classId, ShellExt::kClassId))
        return RefPtr<IClassFactory>(new ClassFactory<ShellExt>);
    if (IsEqualCLSID(classId, StubFolder::kClassId))
        return RefPtr<IClassFactory>(new ClassFactory<StubFolder>);
    return RefPtr<IClassFactory>();
}

} // namespace tavi
