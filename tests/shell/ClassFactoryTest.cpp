#include "shell/ClassFactory.h"

#include <fstream>

#include "tests/shell/LoadedModule.h"

namespace tavi {
namespace {

using namespace test;
using ClassFactoryTest = HostTest;

TEST_F(ClassFactoryTest, CreatesObjectsThatAnswerTheirInterfacesOnly)
{
    LoadedModule module;
    const std::tuple<CLSID, IID, HRESULT> cases[] = {
        {ShellExt::kClassId, IID_IShellPropSheetExt, E_NOINTERFACE}, // the object has both tables all the same
        {ShellExt::kClassId, IID_IShellIconOverlayIdentifier, E_NOINTERFACE},
        {StubFolder::kClassId, IID_IUnknown, S_OK},
        {StubFolder::kClassId, IID_IPersistFolder2, S_OK},
        {StubFolder::kClassId, IID_IShellFolder2, E_NOINTERFACE},
    };
    for (const auto& [classId, interfaceId, result] : cases) {
        const auto factory = module.factory(classId);
        RefPtr<IUnknown> made;
        EXPECT_EQ(factory->CreateInstance(nullptr, interfaceId, made.outVoid()), result);
        EXPECT_EQ(factory->CreateInstance(factory.get(), interfaceId, made.outVoid()), CLASS_E_NOAGGREGATION);
        EXPECT_EQ(factory->LockServer(TRUE), S_OK);
        EXPECT_EQ(module.canUnload(), S_FALSE);
    }
    EXPECT_EQ(module.canUnload(), S_OK) << "a lock does not count";
}

TEST_F(ClassFactoryTest, LeavesNothingOfAnObjectThatCannotBeCreated)
{
    LoadedModule module;
    for (const std::wstring& directory : {std::wstring(L"C:\\no such folder"), service.file(L"")}) {
        service.install().SetValue(L"ConfigPath", wxString(directory));
        DeleteFileW(service.file(L"taviconf.dat").c_str());
        void* object = &module;
        EXPECT_TRUE(FAILED(module.factory(ShellExt::kClassId)->CreateInstance(nullptr, IID_IUnknown, &object)));
        EXPECT_EQ(object, nullptr);
    }
    EXPECT_EQ(module.canUnload(), S_OK);
    std::ifstream file(toUtf8(service.file(L"tavi.log")));
    const std::string log(std::istreambuf_iterator<char>(file), {});
    for (const char* reason : {"14: DB_CANTOPEN[14]: ", "1: DB_ERROR[1]: "})
        EXPECT_NE(log.find("Error: Failed to open folder-state db (" + std::string(reason)), std::string::npos) << log;
    EXPECT_EQ(log.find("Unhandled"), std::string::npos) << log;
}

} // namespace
} // namespace tavi
