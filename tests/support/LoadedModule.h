#pragma once

#include <shlobj.h>
#include <wx/stdpaths.h>

#include "shell/ShellExt.h"
#include "shell/StubFolder.h"
#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Dialogs.h"

namespace tavi::test {

inline std::wstring modulePath()
{
    const wxString own = wxStandardPaths::Get().GetExecutablePath();
    return own.substr(0, own.rfind(L"\\tests\\")).ToStdWstring() + L"\\tavishell.dll";
}

// The module as a host uses it, mapped for as long as this object lives.
struct LoadedModule {
    LoadedModule()
    {
        findFunction(module, "DllGetClassObject", classObject);
        findFunction(module, "DllCanUnloadNow", canUnload);
    }
    ~LoadedModule()
    {
        EXPECT_EQ(canUnload(), S_OK);
        FreeLibrary(module);
        EXPECT_TRUE(waitUntil([] { return !GetModuleHandleW(L"tavishell.dll"); })) << "a worker keeps it mapped";
    }
    template <class Interface>
    RefPtr<Interface> object(REFCLSID classId, REFIID interfaceId) const
    {
        RefPtr<IClassFactory> factory;
        RefPtr<Interface> made;
        EXPECT_EQ(classObject(classId, IID_IClassFactory, factory.outVoid()), S_OK);
        EXPECT_EQ(factory->CreateInstance(nullptr, interfaceId, made.outVoid()), S_OK);
        return made;
    }

    HMODULE module = LoadLibraryW(modulePath().c_str());
    decltype(&DllGetClassObject) classObject = nullptr;
    decltype(&DllCanUnloadNow) canUnload = nullptr;
};

// A service that has backed up C:\windows, which it lists as a file, too, and that knows the states of two files.
struct HostTest : testing::Test {
    HostTest()
    {
        CoInitialize(nullptr);
        service.createTables();
        service.storeManifest(packed("FILES\nC:\\windows\n1:1:1:1:0::0:0\n\nC:\\windows\\f\n1:1:1:1:0::0:0"));
        service.database(L"tavistate.dat").execDML("INSERT INTO file_states VALUES('C:\\in',1),('C:\\out',2)");
    }
    ~HostTest() override
    {
        CoUninitialize();
    }
    // Initializes the object with that folder, or with nothing, and returns how many commands it adds to a menu.
    static HRESULT commandsFor(IContextMenu& object, const wchar_t* folder)
    {
        const ItemIdList items(folder ? ILCreateFromPathW(folder) : nullptr);
        RefPtr<IShellExtInit> init;
        object.QueryInterface(IID_IShellExtInit, init.outVoid());
        EXPECT_EQ(init->Initialize(items.get(), nullptr, nullptr), S_OK);
        const HMENU popup = CreatePopupMenu();
        const HRESULT used = object.QueryContextMenu(popup, 0, 1, 9, 0);
        DestroyMenu(popup);
        return used;
    }
    InstalledService service;
};

} // namespace tavi::test
