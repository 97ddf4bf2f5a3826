#include <windows.h>
#include <objbase.h>

#include "core/Boundary.h"
#include "core/Module.h"
#include "core/RefCounted.h"
#include "core/RuntimeCleanup.h"
#include "shell/ClassFactory.h"
#include "shell/Lifecycle.h"
#include "shell/Registration.h"

using namespace tavi;

STDAPI DllGetClassObject(REFCLSID classId, REFIID interfaceId, void** object)
{
    return guarded("DllGetClassObject", E_OUTOFMEMORY, [&]() -> HRESULT {
        if (!object)
            return E_POINTER;
        *object = nullptr;
        const auto factory = RefPtr<IClassFactory>::adopt(makeClassFactory(classId));
        if (!factory)
            return CLASS_E_CLASSNOTAVAILABLE;
        resumeThreads();
        return factory->QueryInterface(interfaceId, object);
    });
}

STDAPI DllCanUnloadNow()
{
    return guarded("DllCanUnloadNow", S_FALSE, []() -> HRESULT {
        if (moduleRefCount() != 0)
            return S_FALSE;
        requestThreadsStop();
        // An object that was made meanwhile found the threads still running.
        if (moduleRefCount() != 0) {
            resumeThreads();
            return S_FALSE;
        }
        // The host may free the module next, on this thread, while the last reference is one of ours.
        releaseThreadRuntime();
        return S_OK;
    });
}

// Both return raw system error codes, not results: registration tools show them as they are.
STDAPI DllRegisterServer()
{
    return guarded("DllRegisterServer", E_FAIL, [] { return static_cast<HRESULT>(registerServer()); });
}

STDAPI DllUnregisterServer()
{
    return guarded("DllUnregisterServer", E_FAIL, [] { return static_cast<HRESULT>(unregisterServer()); });
}
