#include <windows.h>
#include <objbase.h>

#include "core/Boundary.h"
#include "core/Module.h"
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
        const RefPtr<IClassFactory> factory = makeClassFactory(classId);
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
        // An object that was created meanwhile found the threads still running, and so did not resume them.
        if (moduleRefCount() != 0) {
            resumeThreads();
            return S_FALSE;
        }
        // The host may free the module next. If one of the module's threads then holds the last reference, what the C++
        // runtime keeps for this thread would outlive the module.
        releaseThreadRuntime();
        return S_OK;
    });
}

// Both return the system's error code, not an HRESULT: registration tools show the code as it is.
STDAPI DllRegisterServer()
{
    return guarded("DllRegisterServer", E_FAIL, [] { return static_cast<HRESULT>(registerServer()); });
}

STDAPI DllUnregisterServer()
{
    return guarded("DllUnregisterServer", E_FAIL, [] { return static_cast<HRESULT>(unregisterServer()); });
}
