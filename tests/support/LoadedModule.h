#pragma once

#include <shlobj.h>

#include "shell/ShellExt.h"
#include "shell/StubFolder.h"
#include "statedb/Database.h"
#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Dialogs.h"

namespace tavi::test {

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
    }
    RefPtr<IClassFactory> factory(REFCLSID classId) const
    {
        RefPtr<IClassFactory> made;
        EXPECT_EQ(classObject(classId, IID_IClassFactory, made.outVoid()), S_OK);
        return made;
    }
    template <class Interface>
    RefPtr<Interface> object(REFCLSID classId, REFIID interfaceId) const
    {
        RefPtr<Interface> made;
        EXPECT_EQ(factory(classId)->CreateInstance(nullptr, interfaceId, made.outVoid()), S_OK);
        return made;
    }
    static bool isUnmapped()
    {
        return waitUntil([] { return !GetModuleHandleW(L"tavishell.dll"); });
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
        DbConnection config, state;
        config.open(service.file(L"taviconf.dat"));
        config.execDML("CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
        std::string manifest;
        for (const char byte : packed("FILES\nC:\\windows\n1:1:1:1:0::0:0\n\nC:\\windows\\f\n1:1:1:1:0::0:0"))
            manifest += wxString::Format("%02x", static_cast<unsigned char>(byte)).utf8_string();
        state.open(service.file(L"tavistate.dat"));
        state.execDML(("CREATE TABLE manifest(contents BLOB); INSERT INTO manifest VALUES(x'" + manifest + "');" +
                       "CREATE TABLE file_states(filename TEXT, state INTEGER);"
                       "INSERT INTO file_states VALUES('C:\\in',1),('C:\\out',2)")
                          .c_str());
    }
    ~HostTest() override
    {
        EXPECT_TRUE(LoadedModule::isUnmapped()) << "its log file must be closed before the folder is deleted";
        CoUninitialize();
    }
    // Initializes the object with that folder, or with nothing, and returns how many commands it adds to a menu.
    static HRESULT commandsFor(IContextMenu& object, const wchar_t* folder)
    {
        ItemIdList items;
        if (folder)
            SHParseDisplayName(folder, nullptr, items.out(), 0, nullptr);
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
