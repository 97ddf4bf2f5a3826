// Runs as explorer.exe: the module is loaded, used and freed as the file manager does it.
#include <fstream>
#include <map>

#include <process.h>

#include <windows.h>
#include <olectl.h>
#include <shellapi.h>
#include <shlobj.h>

#include "core/Handles.h"
#include "core/RefCounted.h"
#include "shell/ClassIds.h"
#include "statedb/Database.h"
#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Counts.h"
#include "tests/support/Pipes.h"
#include "ui/PropertyPage.h"

namespace tavi {
namespace {

// The module, loaded for as long as it lives.
struct LoadedModule {
    LoadedModule()
    {
        findFunction(module, "DllGetClassObject", classObject);
        findFunction(module, "DllCanUnloadNow", canUnload);
        findFunction(module, "DllRegisterServer", registerServer);
        findFunction(module, "DllUnregisterServer", unregisterServer);
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

    HMODULE module = LoadLibraryW(test::modulePath().c_str());
    decltype(&DllGetClassObject) classObject = nullptr;
    decltype(&DllCanUnloadNow) canUnload = nullptr;
    decltype(&DllRegisterServer) registerServer = nullptr;
    decltype(&DllUnregisterServer) unregisterServer = nullptr;
};

bool moduleGoes()
{
    return test::waitUntil([] { return !GetModuleHandleW(L"tavishell.dll"); });
}

struct ModuleHost : testing::Test {
    ModuleHost()
    {
        CoInitialize(nullptr);
        runSql(L"taviconf.dat", "CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
        // Lists the folder itself, too, as a page needs it.
        std::string manifest;
        for (const char byte : test::packed("FILES\nC:\\windows\n1:1:1:1:0::0:0\n\nC:\\windows\\f\n1:1:1:1:0::0:0"))
            manifest += wxString::Format("%02x", static_cast<unsigned char>(byte)).utf8_string();
        runSql(L"tavistate.dat", "CREATE TABLE file_states(filename TEXT, state INTEGER);"
                                 "INSERT INTO file_states VALUES('C:\\in',1),('C:\\out',2);"
                                 "CREATE TABLE manifest(contents BLOB); INSERT INTO manifest VALUES(x'" +
                                     manifest + "')");
    }
    ~ModuleHost() override
    {
        EXPECT_TRUE(moduleGoes()); // the log file must be closed before its folder goes
        CoUninitialize();
    }
    void runSql(const wchar_t* file, const std::string& sql) const
    {
        DbConnection database;
        database.open(service.file(file));
        database.execDML(sql.c_str());
    }
    test::InstalledService service;
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
        {kShellExtClassId, IID_IShellPropSheetExt, E_NOINTERFACE}, // both tables exist and stay unreachable
        {kShellExtClassId, IID_IShellIconOverlayIdentifier, E_NOINTERFACE},
        {kStubFolderClassId, IID_IUnknown, S_OK},
        {kStubFolderClassId, IID_IPersistFolder2, S_OK},
        {kStubFolderClassId, IID_IShellFolder2, E_NOINTERFACE},
    };
    for (const auto& [classId, interfaceId, result] : answers) {
        auto factory = module.factory(classId);
        RefPtr<IUnknown> made;
        EXPECT_EQ(factory->CreateInstance(nullptr, interfaceId, made.outVoid()), result);
        EXPECT_EQ(factory->CreateInstance(factory.get(), interfaceId, made.outVoid()), CLASS_E_NOAGGREGATION);
        EXPECT_EQ(factory->LockServer(TRUE), S_OK);
        EXPECT_EQ(module.canUnload(), S_FALSE);
    }
    EXPECT_EQ(module.canUnload(), S_OK);
}

TEST_F(ModuleHost, GoesOnWhenItIsUsedAfterItWasAllowedToGo)
{
    const wchar_t* const pipe = L"\\\\.\\pipe\\tavistatus";
    const test::PipeServer servers[] = {{pipe, PIPE_ACCESS_OUTBOUND, 2}, {pipe, PIPE_ACCESS_OUTBOUND, 2}};
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
    for (const auto& [path, result] : {std::pair(L"C:\\in", S_OK), {L"C:\\out", S_FALSE}, {L"C:\\unknown", S_FALSE}})
        EXPECT_EQ(overlay->IsMemberOf(path, 0), result) << path;
    int index = 77, priority = -1;
    DWORD flags = 88;
    wchar_t file[MAX_PATH];
    EXPECT_EQ(overlay->GetOverlayInfo(file, 10, &index, &flags), HRESULT(0x8007007A));
    EXPECT_EQ(overlay->GetOverlayInfo(file, -1, &index, &flags), E_INVALIDARG);
    EXPECT_TRUE(index == 77 && flags == 88);
    EXPECT_EQ(overlay->GetOverlayInfo(file, MAX_PATH, &index, &flags), S_OK);
    EXPECT_TRUE(file == test::modulePath() && index == 3 && flags == 3);
    EXPECT_TRUE(DestroyIcon(ExtractIconW(nullptr, file, 3)));
    EXPECT_TRUE(overlay->GetPriority(&priority) == S_OK && priority == 99);
}

// Initializes the object with that folder, or with nothing, and returns how many commands it adds to a menu then.
HRESULT commandsFor(IContextMenu& object, const wchar_t* folder)
{
    LPITEMIDLIST items = nullptr;
    if (folder)
        SHParseDisplayName(folder, nullptr, &items, 0, nullptr);
    RefPtr<IShellExtInit> init;
    object.QueryInterface(IID_IShellExtInit, init.outVoid());
    EXPECT_EQ(init->Initialize(items, nullptr, nullptr), S_OK);
    ILFree(items);
    const HMENU popup = CreatePopupMenu();
    const HRESULT used = object.QueryContextMenu(popup, 0, 1, 9, 0);
    DestroyMenu(popup);
    return used;
}

TEST_F(ModuleHost, OffersWhatItsLastInitializeWasGiven)
{
    LoadedModule module;
    const auto menu = module.object<IContextMenu>(kShellExtClassId, IID_IContextMenu);
    RefPtr<IUnknown> object;
    menu->QueryInterface(IID_IUnknown, object.outVoid());
    auto* const sheet = reinterpret_cast<IShellPropSheetExt*>(object.get());
    EXPECT_EQ(sheet->ReplacePage(0, nullptr, 0), E_FAIL);
    const std::tuple<const wchar_t*, HRESULT, const wchar_t*> cases[] = {
        {L"C:\\windows", 1, L"Restore files in windows from the Tavi servers."},
        {L"C:\\windows\\system32", 0, L"Restore files in system32 from the Tavi servers."},
        {nullptr, 0, L"Restore older versions of the selected files."}};
    for (const auto& [folder, used, help] : cases) {
        EXPECT_TRUE(test::waitUntil([&, from = folder, expected = used] {
            return commandsFor(*menu.get(), from) == expected;
        })) << "with the manifest loaded";
        wchar_t text[100] = L"";
        menu->GetCommandString(0, GCS_HELPTEXTW, nullptr, reinterpret_cast<LPSTR>(text), 100);
        EXPECT_STREQ(text, help);
        HPROPSHEETPAGE page = nullptr;
        EXPECT_EQ(sheet->AddPages(test::takePage, reinterpret_cast<LPARAM>(&page)), S_OK);
        EXPECT_EQ(page != nullptr, used == 1);
        DestroyPropertySheetPage(page);
    }
}

TEST_F(ModuleHost, ServesAFolderThatParsesAllNamesToNothingAndRefusesTheRest)
{
    LoadedModule module;
    const auto persist = module.object<IPersistFolder>(kStubFolderClassId, IID_IPersistFolder2);
    RefPtr<IShellFolder> folder;
    persist->QueryInterface(IID_IShellFolder, folder.outVoid());
    // Two tables, the count, a word that nothing reads.
    auto* const fields = reinterpret_cast<void***>(persist.get());
    const auto* const words = reinterpret_cast<const std::int32_t*>(fields + 2);
    EXPECT_TRUE(static_cast<void*>(folder.get()) == fields + 1 && words[0] == 2 && words[1] == -1);
    MEMORY_BASIC_INFORMATION behind{};
    VirtualQuery(fields[0][5], &behind, sizeof(behind));
    EXPECT_NE(behind.Protect, DWORD{PAGE_EXECUTE_READ}) << "the first table ends after 5 entries";
    CLSID classId{};
    EXPECT_TRUE(persist->GetClassID(&classId) == S_OK && classId == kStubFolderClassId);
    const ITEMIDLIST desktop{};
    LPCITEMIDLIST given = &desktop;
    EXPECT_EQ(persist->Initialize(given), S_OK);
    wchar_t name[] = L"any";
    ULONG eaten = 7, attributes = 0xFFFFFFFF;
    LPITEMIDLIST parsed = nullptr;
    EXPECT_EQ(folder->ParseDisplayName(nullptr, nullptr, name, nullptr, &parsed, nullptr), S_OK);
    ILFree(parsed);
    EXPECT_EQ(folder->ParseDisplayName(nullptr, nullptr, name, &eaten, &parsed, &attributes), S_OK);
    EXPECT_TRUE(ILGetSize(parsed) == sizeof(USHORT) && eaten == 0 && attributes == 0x01C43E88);
    ILFree(parsed);
    void* out = &module;
    STRRET text{};
    for (const HRESULT refused :
         {folder->EnumObjects(nullptr, 0, reinterpret_cast<IEnumIDList**>(&out)),
          folder->BindToObject(given, nullptr, IID_IShellFolder, &out),
          folder->BindToStorage(given, nullptr, IID_IStream, &out), folder->CompareIDs(0, given, given),
          folder->CreateViewObject(nullptr, IID_IUnknown, &out), folder->GetAttributesOf(1, &given, &attributes),
          folder->GetUIObjectOf(nullptr, 1, &given, IID_IDataObject, nullptr, &out),
          folder->GetDisplayNameOf(given, SHGDN_NORMAL, &text),
          folder->SetNameOf(nullptr, given, name, SHGDN_NORMAL, nullptr)})
        EXPECT_EQ(refused, E_FAIL);
    EXPECT_TRUE(out == &module && attributes == 0x01C43E88);
}

TEST_F(ModuleHost, AnObjectThatCannotBeMadeLeavesNothingBehind)
{
    LoadedModule module;
    for (const std::wstring& directory : {std::wstring(L"C:\\no such folder"), service.file(L"")}) {
        service.install().SetValue(L"ConfigPath", wxString(directory));
        DeleteFileW(service.file(L"taviconf.dat").c_str());
        void* object = &module;
        EXPECT_TRUE(FAILED(module.factory(kShellExtClassId)->CreateInstance(nullptr, IID_IUnknown, &object)));
        EXPECT_EQ(object, nullptr);
    }
    EXPECT_EQ(module.canUnload(), S_OK);
    std::ifstream file(toUtf8(service.file(L"tavi.log")));
    const std::string log(std::istreambuf_iterator<char>(file), {});
    for (const char* reason : {"14: DB_CANTOPEN[14]: ", "1: DB_ERROR[1]: "})
        EXPECT_NE(log.find("Error: Failed to open folder-state db (" + std::string(reason)), std::string::npos) << log;
    EXPECT_EQ(log.find("Unhandled"), std::string::npos) << log;
}

TEST_F(ModuleHost, TwentyRoundsOfLoadAndUnloadLeaveNothingBehind)
{
    // Wine's printing library, which the common dialogs bring, leaves a mutex behind at each of its own unloads.
    const HMODULE dialogs = LoadLibraryW(L"comdlg32.dll");
    test::Counts before;
    const std::size_t threads = test::countThreads();
    constexpr int kRounds = 23, kWarmUp = 3;
    for (int round = 0; round < kRounds; ++round) {
        if (round == kWarmUp)
            before = test::countNow();
        {
            LoadedModule module;
            const auto menu = module.object<IContextMenu>(kShellExtClassId, IID_IContextMenu);
            // Freed in every second round once the menu has had its bitmap, in the others while the watcher starts.
            const auto isUsed = [&] { return commandsFor(*menu.get(), L"C:\\") == 1; };
            EXPECT_TRUE(isUsed() || round % 2 == 1 || test::waitUntil(isUsed));
        }
        ASSERT_TRUE(moduleGoes()) << "round " << round;
        // The thread that unmapped the module needs a moment more.
        ASSERT_TRUE(test::waitUntil([&] { return test::countThreads() == threads; }));
    }
    EXPECT_EQ(test::countNow(), before);
    FreeLibrary(dialogs);
}

TEST_F(ModuleHost, TheEndOfAPageLetsComFreeWhatNobodyUses)
{
    LoadedModule().registerServer();
    EXPECT_EQ(CoGetClassObject(kShellExtClassId, CLSCTX_INPROC_SERVER, nullptr, IID_IClassFactory,
                               RefPtr<IClassFactory>().outVoid()),
              S_OK);
    // The page is this program's own; the module is a library that COM has loaded for it.
    setModuleInstance(GetModuleHandleW(nullptr));
    HPROPSHEETPAGE page = nullptr;
    addPropertyPage({{L"C:\\f"}, 0, 1, false, {}}, Manifest::parse(L"FILES\nC:\\f\n1:1:1:1:0::0:0"), test::takePage,
                    reinterpret_cast<LPARAM>(&page));
    EXPECT_TRUE(GetModuleHandleW(L"tavishell.dll"));
    DestroyPropertySheetPage(page);
    EXPECT_TRUE(moduleGoes());
}

TEST_F(ModuleHost, GivesAToolTheClassesAndNothingElse)
{
    const wxString own = wxStandardPaths::Get().GetExecutablePath(), tool = own.BeforeLast(L'\\') + L"\\verclsid.exe";
    if (own != tool) {
        EXPECT_TRUE(CopyFileW(own.wc_str(), tool.wc_str(), FALSE));
        EXPECT_EQ(_wspawnl(_P_WAIT, tool.wc_str(), tool.wc_str(), L"--gtest_filter=*Tool*", nullptr), 0);
        DeleteFileW(tool.wc_str());
        // The other program has deleted the key at its end.
        service.install().Close();
        service.install().Create();
        return;
    }
    const std::size_t before = test::countThreads();
    const LoadedModule module;
    module.object<IContextMenu>(kShellExtClassId, IID_IContextMenu);
    EXPECT_EQ(test::countThreads(), before);
    EXPECT_EQ(GetFileAttributesW(service.file(L"tavi.log").c_str()), INVALID_FILE_ATTRIBUTES);
}

const wxString kOwnKey = L"HKEY_CURRENT_USER\\Software\\TaviTest";

// Puts an empty key in the place of the system's as this process sees them, and takes it away again.
void redirectRegistry(bool redirects)
{
    RegistryKey own;
    wxRegKey(kOwnKey).DeleteSelf();
    if (redirects)
        RegCreateKeyW(HKEY_CURRENT_USER, L"Software\\TaviTest", own.out());
    for (const HKEY key : {HKEY_CLASSES_ROOT, HKEY_LOCAL_MACHINE})
        EXPECT_EQ(RegOverridePredefKey(key, own.get()), ERROR_SUCCESS);
}

using Values = std::map<wxString, wxString>;

// The values below a key by their paths. The shell's own functions write below CurrentVersion, too, at any time: the
// system may list a key twice.
void addValues(const wxString& path, Values& all)
{
    wxRegKey key(path);
    wxString name, text;
    long at = 0;
    const bool isOfTheShell = path.Contains(L"CurrentVersion") && !path.Contains(L"Approved");
    for (bool more = key.GetFirstValue(name, at); more && !isOfTheShell; more = key.GetNextValue(name, at)) {
        EXPECT_TRUE(key.GetValueType(name) == wxRegKey::Type_String && key.QueryValue(name, text)) << path << name;
        all[path.substr(kOwnKey.length()) + L"\\" + name] = text;
    }
    for (bool more = key.GetFirstKey(name, at); more; more = key.GetNextKey(name, at))
        addValues(path + L"\\" + name, all);
}

TEST_F(ModuleHost, RegistersAndUnregistersStepByStep)
{
    const wxString id = L"{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}", shown = L"Tavi Remote Backup Shell Extension",
                   classes = L"\\CLSID\\", menus = L"\\shellex\\ContextMenuHandlers\\Tavi",
                   approved = L"\\Software\\Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved\\";
    Values left;
    for (const wchar_t* kind : {L"AllFilesystemObjects", L"Drive", L"Directory", L"Directory\\Background", L"Folder"})
        left[L"\\" + (kind + menus) + L"\\"] = id;
    Values all = left;
    all[classes + id + L"\\"] = shown;
    all[classes + id + L"\\InProcServer32\\"] = test::modulePath();
    all[classes + id + L"\\InProcServer32\\ThreadingModel"] = L"Apartment";

    LoadedModule module;
    redirectRegistry(true);
    const auto expect = [](HRESULT(STDAPICALLTYPE * run)(), HRESULT result, const Values& values) {
        EXPECT_EQ(run(), result);
        Values found;
        addValues(kOwnKey, found);
        EXPECT_EQ(found, values);
    };
    expect(module.registerServer, ERROR_FILE_NOT_FOUND, all); // the approved list is not made
    wxRegKey(kOwnKey + approved).Create();
    all[approved + id] = left[approved + id] = shown;
    expect(module.registerServer, 0, all);

    // Scripts know that the handlers and the approved value stay behind: each key is looked for below the list of
    // classes, and only with all of them there the run is complete.
    expect(module.unregisterServer, ERROR_FILE_NOT_FOUND, left);
    std::vector<wxString> keys{id, L"AllFileSystemObjects\\shellex\\PropertySheetHandlers\\Tavi"};
    for (const wchar_t* kind :
         {L"AllFileSystemObjects", L"Directory\\Background", L"Directory", L"Drive", L"Folder", L"*"})
        keys.push_back(kind + menus);
    for (const wxString& key : keys)
        wxRegKey(kOwnKey + classes + key + L"\\a\\b").Create();
    left.erase(approved + id);
    expect(module.unregisterServer, 0, left);
    for (const wxString& key : keys)
        EXPECT_FALSE(wxRegKey(kOwnKey + classes + key).Exists()) << key;
    redirectRegistry(false);
}

} // namespace
} // namespace tavi
