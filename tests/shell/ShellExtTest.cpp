#include "shell/ShellExt.h"

#include <shellapi.h>

#include "tests/support/LoadedModule.h"

using namespace tavi;
using namespace tavi::test;
using ShellExtTest = HostTest;
using StubFolderTest = HostTest;

TEST_F(ShellExtTest, HasTheOverlayTableBehindTheOthers)
{
    LoadedModule module;
    const auto object = module.object<IUnknown>(ShellExt::kClassId, IID_IUnknown);
    auto* const overlay = reinterpret_cast<IShellIconOverlayIdentifier*>(reinterpret_cast<void**>(object.get()) + 3);
    for (const auto& [path, result] : {std::pair(L"C:\\in", S_OK), {L"C:\\out", S_FALSE}, {L"C:\\unknown", S_FALSE}})
        EXPECT_EQ(overlay->IsMemberOf(path, 0), result) << path;
    int index = 77, priority = -1;
    DWORD flags = 88;
    wchar_t file[MAX_PATH];
    EXPECT_EQ(overlay->GetOverlayInfo(file, 10, &index, &flags), HRESULT(0x8007007A));
    EXPECT_EQ(overlay->GetOverlayInfo(file, -1, &index, &flags), E_INVALIDARG);
    EXPECT_EQ(std::pair(index, flags), std::pair(77, DWORD{88}));
    EXPECT_EQ(overlay->GetOverlayInfo(file, MAX_PATH, &index, &flags), S_OK);
    EXPECT_EQ(std::pair(index, flags), std::pair(3, DWORD{3}));
    EXPECT_EQ(file, modulePath());
    EXPECT_TRUE(DestroyIcon(ExtractIconW(nullptr, file, 3)));
    EXPECT_EQ(overlay->GetPriority(&priority), S_OK);
    EXPECT_EQ(priority, 99);
}

TEST_F(ShellExtTest, OffersWhatItsLastInitializeWasGiven)
{
    LoadedModule module;
    const auto menu = module.object<IContextMenu>(ShellExt::kClassId, IID_IContextMenu);
    RefPtr<IUnknown> object;
    menu->QueryInterface(IID_IUnknown, object.outVoid());
    auto* const sheet = reinterpret_cast<IShellPropSheetExt*>(object.get());
    for (const auto& [folder, used] : {std::pair(L"C:\\windows", 1), {nullptr, 0}, {L"C:\\windows\\system32", 0}}) {
        EXPECT_TRUE(waitUntil([&, from = folder, expected = used] { return commandsFor(*menu, from) == expected; }))
            << "with the manifest loaded";
        HPROPSHEETPAGE page = nullptr;
        EXPECT_EQ(sheet->AddPages(takePage, reinterpret_cast<LPARAM>(&page)), S_OK);
        EXPECT_EQ(page != nullptr, used == 1);
        DestroyPropertySheetPage(page);
    }
}

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
