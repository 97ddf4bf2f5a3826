#include "shell/StubFolder.h"

#include "tests/shell/LoadedModule.h"

namespace tavi {
namespace {

using namespace test;

struct StubFolderTest : HostTest {
    LoadedModule module;
    RefPtr<IPersistFolder> persist = module.object<IPersistFolder>(StubFolder::kClassId, IID_IPersistFolder2);
    RefPtr<IShellFolder> folder;
    const ITEMIDLIST desktop{};
    LPCITEMIDLIST given = &desktop;
    wchar_t name[4] = L"any";

    StubFolderTest()
    {
        persist->QueryInterface(IID_IShellFolder, folder.outVoid());
    }
};

TEST_F(StubFolderTest, HasTwoTablesAndNoCurFolderInTheFirst)
{
    auto* const fields = reinterpret_cast<void***>(persist.get());
    const auto* const words = reinterpret_cast<const std::int32_t*>(fields + 2);
    EXPECT_EQ(static_cast<void*>(folder.get()), fields + 1);
    EXPECT_TRUE(words[0] == 2 && words[1] == -1) << "the count and the word that nothing reads";
    MEMORY_BASIC_INFORMATION behind{};
    VirtualQuery(fields[0][5], &behind, sizeof(behind));
    EXPECT_NE(behind.Protect, DWORD{PAGE_EXECUTE_READ}) << "the first table ends after 5 entries";
    CLSID classId{};
    EXPECT_TRUE(persist->GetClassID(&classId) == S_OK && classId == StubFolder::kClassId);
    EXPECT_EQ(persist->Initialize(given), S_OK);
}

TEST_F(StubFolderTest, ParsesEveryNameToTheEmptyList)
{
    ULONG eaten = 7, attributes = 0xFFFFFFFF;
    ItemIdList parsed;
    EXPECT_EQ(folder->ParseDisplayName(nullptr, nullptr, name, nullptr, parsed.out(), nullptr), S_OK);
    EXPECT_EQ(folder->ParseDisplayName(nullptr, nullptr, name, &eaten, parsed.out(), &attributes), S_OK);
    EXPECT_TRUE(ILGetSize(parsed.get()) == sizeof(USHORT) && eaten == 0 && attributes == 0x01C43E88);
}

TEST_F(StubFolderTest, RefusesEveryOtherOperation)
{
    void* out = &module;
    SFGAOF attributes = 5;
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
    EXPECT_TRUE(out == &module && attributes == 5);
}

} // namespace
} // namespace tavi
