#pragma once

#include <tuple>

#include <windows.h>
#include <unknwn.h>

#include "core/Boundary.h"

namespace tavi {

// The IUnknown part of the module's COM classes and of their factories. The tables of `Interfaces` come first in the
// object, in that order, then the count, which starts at 0. The count is plain: an object is used only by the thread
// that created it.
//
// `Derived` declares `kInterfaces`, the interfaces that QueryInterface finds.
template <class Derived, class... Interfaces>
class ComObject : public Interfaces... {
  public:
    ComObject(const ComObject&) = delete;
    ComObject& operator=(const ComObject&) = delete;

    STDMETHODIMP QueryInterface(REFIID interfaceId, void** object) override
    {
        return guarded("QueryInterface", E_FAIL, [&]() -> HRESULT {
            if (!object)
                return E_POINTER;
            *object = nullptr;
            for (const InterfaceEntry& entry : Derived::kInterfaces) {
                if (!IsEqualIID(interfaceId, *entry.interfaceId))
                    continue;
                *object = entry.table(static_cast<Derived*>(this));
                AddRef();
                return S_OK;
            }
            return E_NOINTERFACE;
        });
    }

    STDMETHODIMP_(ULONG) AddRef() override
    {
        return guarded("AddRef", ULONG{1}, [&] { return ++references_; });
    }

    STDMETHODIMP_(ULONG) Release() override
    {
        return guarded("Release", ULONG{0}, [&] {
            const ULONG left = --references_;
            if (left == 0)
                delete static_cast<Derived*>(this);
            return left;
        });
    }

    // Returns the first table, which is the object's IUnknown.
    static IUnknown* unknown(Derived* object) noexcept
    {
        return static_cast<std::tuple_element_t<0, std::tuple<Interfaces...>>*>(object);
    }

  protected:
    // An interface that QueryInterface finds, and its table.
    struct InterfaceEntry {
        const IID* interfaceId;
        void* (*table)(Derived* object);
    };
    template <class Interface>
    static void* tableOf(Derived* object)
    {
        return static_cast<Interface*>(object);
    }

    ComObject() = default;
    ~ComObject() = default;

  private:
    ULONG references_ = 0;
};

} // namespace tavi
