// Runs as explorer.exe: the module is loaded, used and freed as the file manager does it.
#include <algorithm>
#include <array>
#include <cstring>
#include <fstream>
#include <map>

#include <process.h>

#include <windows.h>
#include <winternl.h>
#include <shellapi.h>
#include <shlobj.h>
#include <tlhelp32.h>

#include <gtest/gtest.h>

#include "core/Handles.h"
#include "core/Module.h"
#include "core/Text.h"
#include "shell/ClassIds.h"
#include "statedb/Database.h"
#include "tests/backupset/ManifestSupport.h"
#include "tests/support/Counts.h"
#include "tests/support/Pipes.h"
#include "tests/support/Registry.h"
#include "ui/PropertyPage.h"

namespace tavi {
namespace {

std::wstring modulePath()
{
    wchar_t path[MAX_PATH];
    GetModuleFileNameW(nullptr, path, MAX_PATH);
    const std::wstring exe(path);
    return exe.substr(0, exe.rfind(L"\\tests\\")) + L"\\tavishell.dll";
}

void runSql(const std::wstring& path, const char* sql)
{
    DbConnection database;
    database.open(path);
    database.execDML(sql);
}

// The module, loaded for as long as it lives.
struct LoadedModule {
    LoadedModule()
    {
        for (const auto& [name, function] : {std::pair<const char*, void*>{"DllGetClassObject", &classObject},
                                             {"DllCanUnloadNow", &canUnload},
                                             {"DllRegisterServer", &registerServer},
                                             {"DllUnregisterServer", &unregisterServer}}) {
            const FARPROC address = GetProcAddress(module, name);
            EXPECT_NE(address, nullptr) << name;
            std::memcpy(function, &address, sizeof(address));
        }
    }
    ~LoadedModule()
    {
        EXPECT_EQ(canUnload(), S_OK);
        FreeLibrary(module);
    }
    ComPtr<IClassFactory> factory(REFCLSID classId) const
    {
        ComPtr<IClassFactory> made;
        EXPECT_EQ(classObject(classId, IID_IClassFactory, made.outVoid()), S_OK);
        return made;
    }
    template <class Interface>
    ComPtr<Interface> object(REFCLSID classId, REFIID interfaceId) const
    {
        ComPtr<Interface> made;
        EXPECT_EQ(factory(classId)->CreateInstance(nullptr, interfaceId, made.outVoid()), S_OK);
        return made;
    }

    HMODULE module = LoadLibraryW(modulePath().c_str());
    HRESULT(STDAPICALLTYPE* classObject)(REFCLSID, REFIID, void**) = nullptr;
    HRESULT(STDAPICALLTYPE* canUnload)() = nullptr;
    HRESULT(STDAPICALLTYPE* registerServer)() = nullptr;
    HRESULT(STDAPICALLTYPE* unregisterServer)() = nullptr;
};

bool moduleGoesWithin(DWORD milliseconds)
{
    const DWORD start = GetTickCount();
    while (GetModuleHandleW(L"tavishell.dll") && GetTickCount() - start < milliseconds)
        Sleep(10);
    return !GetModuleHandleW(L"tavishell.dll");
}

class ModuleHost : public testing::Test {
  protected:
    ModuleHost()
    {
        CoInitialize(nullptr);
        runSql(service_.file(L"taviconf.dat"), "CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
        runSql(service_.file(L"tavistate.dat"), "CREATE TABLE manifest(contents BLOB);"
                                                "CREATE TABLE file_states(filename TEXT, state INTEGER);"
                                                "INSERT INTO file_states VALUES('C:\\in',1),('C:\\out',2)");
    }
    ~ModuleHost() override
    {
        EXPECT_TRUE(moduleGoesWithin(5000)); // the log file must be closed before its folder goes
        CoUninitialize();
    }
    void storeManifest(const std::string& text) const
    {
        std::string sql = "INSERT INTO manifest VALUES(x'";
        for (const char byte : test::packed(text))
            sql += wxString::Format("%02x", static_cast<unsigned char>(byte)).utf8_string();
        runSql(service_.file(L"tavistate.dat"), (sql + "')").c_str());
    }
    std::string log() const
    {
        std::ifstream file(toUtf8(service_.file(L"tavi.log")));
        return {std::istreambuf_iterator<char>(file), {}};
    }

    test::InstalledService service_;
};

TEST_F(ModuleHost, AnswersAsAComServer)
{
    LoadedModule module;
    void* object = &module;
    EXPECT_EQ(module.classObject(IID_IContextMenu, IID_IClassFactory, &object), CLASS_E_CLASSNOTAVAILABLE);
    EXPECT_EQ(object, nullptr);
    EXPECT_EQ(module.classObject(kShellExtClassId, IID_IClassFactory, nullptr), E_POINTER);
    EXPECT_EQ(module.classObject(kShellExtClassId, IID_IContextMenu, &object), E_NOINTERFACE);
    EXPECT_EQ(module.canUnload(), S_OK); // the factory that was asked in vain is gone

    const std::tuple<CLSID, IID, HRESULT> answers[] = {
        {kShellExtClassId, IID_IUnknown, S_OK},
        {kShellExtClassId, IID_IShellExtInit, S_OK},
        {kShellExtClassId, IID_IContextMenu, S_OK},
        {kShellExtClassId, IID_IShellPropSheetExt, E_NOINTERFACE}, // both tables exist and stay unreachable
        {kShellExtClassId, IID_IShellIconOverlayIdentifier, E_NOINTERFACE},
        {kStubFolderClassId, IID_IUnknown, S_OK},
        {kStubFolderClassId, IID_IPersistFolder, S_OK},
        {kStubFolderClassId, IID_IPersistFolder2, S_OK},
        {kStubFolderClassId, IID_IShellFolder, S_OK},
        {kStubFolderClassId, IID_IShellFolder2, E_NOINTERFACE},
    };
    for (const auto& [classId, interfaceId, result] : answers) {
        auto factory = module.factory(classId);
        ComPtr<IUnknown> made;
        EXPECT_EQ(factory->CreateInstance(nullptr, interfaceId, made.outVoid()), result);
        EXPECT_EQ(static_cast<bool>(made), result == S_OK);
        EXPECT_EQ(factory->CreateInstance(factory.get(), interfaceId, made.outVoid()), CLASS_E_NOAGGREGATION);
        EXPECT_EQ(factory->LockServer(TRUE), S_OK);
        EXPECT_EQ(module.canUnload(), S_FALSE);
    }
    EXPECT_EQ(module.canUnload(), S_OK);
}

TEST_F(ModuleHost, GoesOnWhenItIsUsedAfterItWasAllowedToGo)
{
    const auto pipe = [] { return test::PipeServer(L"\\\\.\\pipe\\tavistatus", PIPE_ACCESS_OUTBOUND, 2); };
    std::array<test::PipeServer, 2> servers{pipe(), pipe()};
    LoadedModule module;
    ASSERT_TRUE(servers[0].waitClient());
    EXPECT_EQ(module.canUnload(), S_OK);
    Sleep(700); // the listener has ended
    const auto factory = module.factory(kShellExtClassId);
    EXPECT_TRUE(servers[1].waitClient());
}

TEST_F(ModuleHost, CarriesTheOverlayTableBehindTheOthers)
{
    LoadedModule module;
    const auto object = module.object<IUnknown>(kShellExtClassId, IID_IUnknown);
    auto* const overlay = reinterpret_cast<IShellIconOverlayIdentifier*>(reinterpret_cast<void**>(object.get()) + 3);
    EXPECT_EQ(overlay->IsMemberOf(L"C:\\in", 0), S_OK);
    EXPECT_EQ(overlay->IsMemberOf(L"C:\\out", 0), S_FALSE);
    int index = 0;
    DWORD flags = 0;
    wchar_t file[MAX_PATH];
    EXPECT_EQ(overlay->GetOverlayInfo(file, 10, &index, &flags), HRESULT(0x8007007A));
    EXPECT_EQ(overlay->GetOverlayInfo(file, MAX_PATH, &index, &flags), S_OK);
    HICON icon = nullptr;
    EXPECT_EQ(ExtractIconExW(file, index, &icon, nullptr, 1), 1u);
    DestroyIcon(icon);
}

TEST_F(ModuleHost, AnObjectThatCannotBeMadeLeavesNothingBehind)
{
    LoadedModule module;
    {
        auto factory = module.factory(kShellExtClassId);
        for (const wchar_t* directory : {L"C:\\no such folder", service_.file(L"").c_str()}) {
            service_.install().SetValue(L"ConfigPath", wxString(directory));
            DeleteFileW(service_.file(L"taviconf.dat").c_str());
            void* object = factory.get();
            EXPECT_TRUE(FAILED(factory->CreateInstance(nullptr, IID_IUnknown, &object)));
            EXPECT_EQ(object, nullptr);
        }
    }
    EXPECT_EQ(module.canUnload(), S_OK);
    EXPECT_NE(log().find("Error: Failed to open folder-state db (14: DB_CANTOPEN[14]: "), std::string::npos) << log();
    EXPECT_EQ(log().find("Unhandled"), std::string::npos) << log();
}

TEST_F(ModuleHost, TwentyRoundsOfLoadAndUnloadLeaveNothingBehind)
{
    storeManifest("FILES\nC:\\f\n1:1:1:1:0:x:0:40");
    LPITEMIDLIST root = nullptr;
    ASSERT_EQ(SHParseDisplayName(L"C:\\", nullptr, &root, 0, nullptr), S_OK);
    // Wine's printing library, which the common dialogs bring, leaves a mutex behind at each of its own unloads.
    const HMODULE dialogs = LoadLibraryW(L"comdlg32.dll");
    std::array<std::size_t, 3> before{};
    constexpr int kRounds = 23, kWarmUp = 3;
    for (int round = 0; round < kRounds; ++round) {
        if (round == kWarmUp)
            before = test::countNow();
        {
            LoadedModule module;
            const auto init = module.object<IShellExtInit>(kShellExtClassId, IID_IShellExtInit);
            ComPtr<IContextMenu> menu;
            init->QueryInterface(IID_IContextMenu, menu.outVoid());
            // Freed in every second round once the menu has had its bitmap, in the others while the watcher starts.
            HRESULT used = 0;
            for (int asked = 0; used == 0 && asked < (round % 2 == 0 ? 500 : 1); ++asked) {
                EXPECT_EQ(init->Initialize(root, nullptr, nullptr), S_OK);
                const HMENU popup = CreatePopupMenu();
                used = menu->QueryContextMenu(popup, 0, 1, 9, 0);
                DestroyMenu(popup);
                Sleep(static_cast<DWORD>(round % 5));
            }
            EXPECT_TRUE(used == 1 || round % 2 == 1);
            EXPECT_EQ(module.canUnload(), S_FALSE);
        }
        ASSERT_TRUE(moduleGoesWithin(5000)) << "round " << round;
    }
    ILFree(root);
    const auto after = test::countNow();
    FreeLibrary(dialogs);
    // The compiler's static thread runtime leaves the two semaphores of its key lock behind at each unload; nobody else
    // may leave anything.
    constexpr std::size_t allowed[] = {2 * (kRounds - kWarmUp), 0, 0};
    for (std::size_t i = 0; i < after.size(); ++i)
        EXPECT_TRUE(before[i] > 0 && after[i] <= before[i] + allowed[i])
            << i << ": " << before[i] << " to " << after[i];
}

BOOL CALLBACK takePage(HPROPSHEETPAGE offered, LPARAM taken)
{
    *reinterpret_cast<HPROPSHEETPAGE*>(taken) = offered;
    return TRUE;
}

TEST_F(ModuleHost, TheEndOfAPageLetsComFreeWhatNobodyUses)
{
    wxRegKey approved(L"HKLM\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved");
    approved.Create();
    EXPECT_EQ(LoadedModule().registerServer(), S_OK);
    ComPtr<IClassFactory> factory;
    EXPECT_EQ(CoGetClassObject(kShellExtClassId, CLSCTX_INPROC_SERVER, nullptr, IID_IClassFactory, factory.outVoid()),
              S_OK);
    factory = {};
    // The page is this program's own; the module is a library that COM has loaded for it.
    setModuleInstance(GetModuleHandleW(nullptr));
    HPROPSHEETPAGE page = nullptr;
    addPropertyPage({{L"C:\\f"}, 0, 1, false, {}}, test::held(Manifest::Parse(L"FILES\nC:\\f\n1:1:1:1:0::0:0")),
                    takePage, reinterpret_cast<LPARAM>(&page));
    EXPECT_TRUE(GetModuleHandleW(L"tavishell.dll"));
    DestroyPropertySheetPage(page);
    EXPECT_TRUE(moduleGoesWithin(5000));
}

TEST_F(ModuleHost, RegistersAndLeavesTheRequiredKeysBehind)
{
    const wxString classId = L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}";
    const std::map<wxString, wxString> defaults = {
        {L"HKCR\\CLSID\\" + classId, L"Tavi Remote Backup Shell Extension"},
        {L"HKCR\\CLSID\\" + classId + L"\\InProcServer32", modulePath()},
        {L"HKCR\\AllFilesystemObjects\\shellex\\ContextMenuHandlers\\Tavi", classId},
        {L"HKCR\\Drive\\shellex\\ContextMenuHandlers\\Tavi", classId},
        {L"HKCR\\Directory\\shellex\\ContextMenuHandlers\\Tavi", classId},
        {L"HKCR\\Directory\\Background\\shellex\\ContextMenuHandlers\\Tavi", classId},
        {L"HKCR\\Folder\\shellex\\ContextMenuHandlers\\Tavi", classId},
    };
    wxRegKey approved(L"HKLM\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved");
    approved.Create();
    const wchar_t* const tool = L"C:\\windows\\system32\\regsvr32.exe";
    for (int again = 0; again < 2; ++again)
        EXPECT_EQ(_wspawnl(_P_WAIT, tool, L"regsvr32.exe", L"/s", modulePath().c_str(), nullptr), 0);
    for (const auto& [key, text] : defaults) {
        wxString value;
        EXPECT_TRUE(wxRegKey(key).QueryValue(wxString(), value)) << key;
        EXPECT_TRUE(value.IsSameAs(text, false)) << key;
    }
    EXPECT_TRUE(wxRegKey(L"HKCR\\CLSID\\" + classId + L"\\InProcServer32").HasValue(L"ThreadingModel"));
    EXPECT_TRUE(approved.HasValue(classId));

    wxRegKey(L"HKCR\\CLSID\\" + classId + L"\\a\\b\\c").Create();
    LoadedModule module;
    EXPECT_EQ(module.unregisterServer(), HRESULT{ERROR_FILE_NOT_FOUND});
    EXPECT_EQ(module.unregisterServer(), HRESULT{ERROR_FILE_NOT_FOUND});
    for (const auto& [key, text] : defaults)
        EXPECT_EQ(wxRegKey(key).Exists(), key.Find(L"CLSID") == wxNOT_FOUND) << key;
    EXPECT_TRUE(approved.HasValue(classId));

    for (const auto& [key, text] : defaults) {
        if (wxRegKey(key).Exists())
            wxRegKey(key).DeleteSelf();
    }
}

} // namespace
} // namespace tavi
