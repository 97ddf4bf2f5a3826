#include <fstream>

#include "tests/support/LoadedModule.h"
#include "tests/support/Pipes.h"
#include "tools/filemanager/Counts.h"
#include "ui/PropertyPage.h"

using namespace tavi;
using namespace tavi::test;
using namespace filemanager;
using ExportsTest = HostTest;

TEST_F(ExportsTest, OfferTheModulesClassesAndTheirInterfacesOnly)
{
    LoadedModule module;
    void* object = &module;
    EXPECT_EQ(module.classObject(IID_IContextMenu, IID_IClassFactory, &object), CLASS_E_CLASSNOTAVAILABLE);
    EXPECT_EQ(object, nullptr);
    EXPECT_EQ(module.classObject(ShellExt::kClassId, IID_IClassFactory, nullptr), E_POINTER);
    EXPECT_EQ(module.classObject(ShellExt::kClassId, IID_IContextMenu, &object), E_NOINTERFACE);
    // A ShellExt has the first two tables all the same.
    const std::pair<CLSID, IID> refused[] = {{ShellExt::kClassId, IID_IShellPropSheetExt},
                                             {ShellExt::kClassId, IID_IShellIconOverlayIdentifier},
                                             {StubFolder::kClassId, IID_IShellFolder2}};
    for (const auto& [classId, interfaceId] : refused) {
        RefPtr<IClassFactory> factory;
        EXPECT_EQ(module.classObject(classId, IID_IClassFactory, factory.outVoid()), S_OK);
        EXPECT_EQ(factory->CreateInstance(nullptr, interfaceId, &object), E_NOINTERFACE);
        EXPECT_EQ(factory->CreateInstance(factory.get(), IID_IUnknown, &object), CLASS_E_NOAGGREGATION);
        EXPECT_EQ(factory->LockServer(TRUE), S_OK);
        EXPECT_EQ(module.canUnload(), S_FALSE);
    }
    EXPECT_EQ(module.canUnload(), S_OK) << "a refused object or a lock counts";
    // An object that cannot be created.
    object = &module;
    service.install().SetValue(L"ConfigPath", wxString(L"C:\\no such folder"));
    RefPtr<IClassFactory> factory;
    module.classObject(ShellExt::kClassId, IID_IClassFactory, factory.outVoid());
    EXPECT_TRUE(FAILED(factory->CreateInstance(nullptr, IID_IUnknown, &object)));
    EXPECT_EQ(object, nullptr);
    std::ifstream file(toUtf8(service.file(L"tavi.log")));
    const std::string log(std::istreambuf_iterator<char>(file), {});
    EXPECT_NE(log.find("Error: Failed to open folder-state db (14: DB_CANTOPEN[14]: "), std::string::npos) << log;
}

TEST_F(ExportsTest, KeepTheThreadsRunningForAnObjectAndServeAHostThatGoesOnWithoutOne)
{
    const int threads = threadCount();
    const PipeServer servers[] = {{kStatus, PIPE_ACCESS_OUTBOUND, 2}, {kStatus, PIPE_ACCESS_OUTBOUND, 2}};
    LoadedModule module;
    ASSERT_TRUE(servers[0].waitClient());
    for (const CLSID& classId : {ShellExt::kClassId, StubFolder::kClassId}) {
        const auto object = module.object<IUnknown>(classId, IID_IUnknown);
        const int running = threadCount();
        EXPECT_EQ(module.canUnload(), S_FALSE);
        Sleep(700); // a thread that was asked to stop has ended
        EXPECT_EQ(threadCount(), running);
    }
    EXPECT_EQ(module.canUnload(), S_OK);
    EXPECT_TRUE(waitUntil([&] { return threadCount() == threads; })) << "a thread has not ended";
    module.object<IUnknown>(ShellExt::kClassId, IID_IUnknown);
    EXPECT_TRUE(servers[1].waitClient());
}

TEST_F(ExportsTest, LeaveNothingBehindInTwentyRoundsOfLoadAndUnload)
{
    // Wine's printing library, which the common dialogs load, leaves a mutex behind at each of its own unloads.
    const HMODULE dialogs = LoadLibraryW(L"comdlg32.dll");
    const auto counts = [] { return objectCounts().substr(0, objectCounts().find(L", memory")); };
    std::wstring before;
    const int threads = threadCount();
    for (int round = -3; round < 20; ++round) { // the first three warm up
        if (round == 0)
            before = counts();
        {
            LoadedModule module;
            const auto menu = module.object<IContextMenu>(ShellExt::kClassId, IID_IContextMenu);
            // Unloads in every second round once the menu has its bitmap, in the others while the watcher starts.
            const auto hasCommand = [&] { return commandsFor(*menu, L"C:\\") == 1; };
            EXPECT_TRUE(hasCommand() || round % 2 != 0 || waitUntil(hasCommand));
        }
        // The thread that unmapped the module needs a moment more.
        ASSERT_TRUE(waitUntil([&] { return threadCount() == threads; })) << "round " << round;
    }
    EXPECT_EQ(counts(), before);
    FreeLibrary(dialogs);
}

TEST_F(ExportsTest, LetComUnloadTheModuleAtTheEndOfAPage)
{
    decltype(&DllCanUnloadNow) enter = nullptr, remove = nullptr;
    {
        const LoadedModule module;
        findFunction(module.module, "DllRegisterServer", enter);
        enter();
    }
    EXPECT_EQ(CoGetClassObject(ShellExt::kClassId, CLSCTX_INPROC_SERVER, nullptr, IID_IClassFactory,
                               RefPtr<IClassFactory>().outVoid()),
              S_OK);
    // The page is this program's own. The module is a library that COM has loaded and that nothing uses.
    setModuleInstance(GetModuleHandleW(nullptr));
    HPROPSHEETPAGE page = nullptr;
    addPropertyPage({{L"C:\\f"}, {}, {}, false, {}}, Manifest::parse(L"FILES\nC:\\f\n1:1:1:1:0::0:0"), takePage,
                    reinterpret_cast<LPARAM>(&page));
    findFunction(GetModuleHandleW(L"tavishell.dll"), "DllUnregisterServer", remove);
    EXPECT_EQ(remove(), HRESULT{ERROR_FILE_NOT_FOUND}) << "the code of the system as it is";
    DestroyPropertySheetPage(page);
    EXPECT_TRUE(waitUntil([] { return !GetModuleHandleW(L"tavishell.dll"); }));
}
