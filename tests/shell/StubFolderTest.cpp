#include "shell/StubFolder.h"

#include "tests/support/LoadedModule.h"

using namespace tavi;
using namespace tavi::test;
using StubFolderTest = HostTest;

TEST_F(StubFolderTest, HasTwoTablesAndParsesEveryNameToTheEmptyList)
{
    LoadedModule module;
    const auto persist = module.object<IPersistFolder>(StubFolder::kClassId, IID_IPersistFolder2);
    RefPtr<IShellFolder> folder;
    persist->QueryInterface(IID_IShellFolder, folder.outVoid());
    auto* const fields = reinterpret_cast<void***>(persist.get());
    EXPECT_EQ(static_cast<void*>(folder.get()), fields + 1);
    const auto* const words = reinterpret_cast<const std::int32_t*>(fields + 2);
    EXPECT_EQ(words[0], 2) << "the count";
    EXPECT_EQ(words[1], -1) << "the word that nothing reads";
    MEMORY_BASIC_INFORMATION behind{};
    VirtualQuery(fields[0][5], &behind, sizeof(behind));
    EXPECT_NE(behind.Protect, DWORD{PAGE_EXECUTE_READ}) << "the first table ends after 5 entries";
    EXPECT_EQ(persist->Initialize(ItemIdList(ILCreateFromPathW(L"C:\\")).get()), S_OK);
    wchar_t name[] = L"any";
    ULONG eaten = 7, attributes = 0xFFFFFFFF;
    ItemIdList parsed;
    EXPECT_EQ(folder->ParseDisplayName(nullptr, nullptr, name, &eaten, parsed.out(), &attributes), S_OK);
    EXPECT_EQ(ILGetSize(parsed.get()), sizeof(USHORT));
    EXPECT_EQ(std::pair(eaten, attributes), std::pair(ULONG{0}, ULONG{0x01C43E88}));
    void* out = &module;
    EXPECT_EQ(folder->EnumObjects(nullptr, 0, reinterpret_cast<IEnumIDList**>(&out)), E_FAIL);
    EXPECT_EQ(folder->BindToObject(parsed.get(), nullptr, IID_IShellFolder, &out), E_FAIL);
    EXPECT_EQ(out, &module);
}
