#include "ui/Selection.h"

#include "statedb/StateLookups.h"
#include "tests/support/Dialogs.h"

using namespace tavi;

namespace {

using SelectionTest = test::UiTest;

UINT driveType = DRIVE_REMOTE;
UINT WINAPI chosenDriveType(LPCWSTR)
{
    return driveType;
}

// Returns what is collected from the shell's own data object for an open folder and the last ids of the items.
PathSet collect(const wxString& folder, const std::vector<wxString>& items)
{
    const ItemIdList parent(ILCreateFromPathW(folder.wc_str()));
    std::vector<ItemIdList> lists;
    std::vector<LPCITEMIDLIST> ids;
    for (const wxString& item : items) {
        lists.emplace_back(ILCreateFromPathW(item.wc_str()));
        ids.push_back(ILFindLastID(lists.back().get()));
    }
    RefPtr<IDataObject> data;
    CIDLData_CreateFromIDArray(parent.get(), UINT(ids.size()), ids.data(), data.out());
    return collectPaths(parent.get(), data.get(), chosenDriveType);
}

TEST_F(SelectionTest, TakesTheShellsItemsButNoneTooLong)
{
    // The items keep their own names in the longer folder.
    const wxString parent = in(wxString(L'd', 200 - in(L"").size())), name(L'f', 58),
                   rare = parent + L"\\\u65e5\U0001F4BE", sub = parent + L"\\sub";
    std::filesystem::create_directories(sub.wc_str());
    for (const wxString& each : {in(name), in(name + L"f"), rare})
        std::ofstream(each.wc_str());
    EXPECT_EQ(collect(parent, {in(name), in(name + L"f"), rare, sub}),
              PathSet({parent, rare, sub, parent + L"\\" + name}));
}

TEST_F(SelectionTest, TakesNoVirtualItemAndNoDriveThatIsNotFixed)
{
    const wxString computer = L"::{20D04FE0-3AEA-1069-A2D8-08002B30309D}";
    for (driveType = DRIVE_UNKNOWN; driveType <= DRIVE_RAMDISK; ++driveType)
        EXPECT_EQ(collect(computer, {computer + L"\\::{21EC2020-3AEA-1069-A2DD-08002B30309D}", L"C:\\"}).size(),
                  driveType == DRIVE_FIXED ? 1u : 0u);
}

TEST_F(SelectionTest, NeverReadsOutsideAForgedBlock)
{
    // The number of words and the words: counts and offsets beyond the block, and lists that do not end inside it.
    FORMATETC request{CLIPFORMAT(RegisterClipboardFormatW(CFSTR_SHELLIDLIST)), nullptr, DVASPECT_CONTENT, -1,
                      TYMED_HGLOBAL};
    const UINT blocks[][5] = {{1, 1, 0, 0, 0},     {2, 1 << 30, 0, 0, 0},   {3, ~1u, 0, 0, 0},
                              {4, 1, 12, 15, 0},   {4, 1, 12, 14, 1 << 16}, {4, 1, 12, 14, 0x7FFF0000},
                              {4, 1, ~0u, ~15u, 0}};
    for (const auto& block : blocks) {
        const SIZE_T size = block[0] * sizeof(UINT);
        DWORD connection = 0;
        STGMEDIUM medium{TYMED_HGLOBAL, {}, nullptr};
        medium.hGlobal = std::memcpy(GlobalAlloc(GMEM_FIXED, size), block + 1, size);
        RefPtr<IOleCache> cache; // accepts any block
        RefPtr<IDataObject> data;
        CreateDataCache(nullptr, CLSID_NULL, IID_IOleCache, cache.outVoid());
        cache->QueryInterface(IID_IDataObject, data.outVoid());
        cache->Cache(&request, 0, &connection);
        cache->SetData(&request, &medium, TRUE);
        EXPECT_EQ(data->QueryGetData(&request), S_OK);
        EXPECT_TRUE(collectPaths(nullptr, data.get(), chosenDriveType).empty()) << testing::PrintToString(block);
    }
}

TEST_F(SelectionTest, SummarizesVersionsAndStates)
{
    const ManifestRef manifest = Manifest::parse(L"FILES\n" + in(L"a.txt\n5:5:5:9:0::0:0\n6:6:6:-1:0::0:0\n\n") +
                                                 in(L"sub\\deep\\c.txt\n5:5:5:9:0::0:0\n"));
    CreateDirectoryW(in(L"sub").wc_str(), nullptr);
    service.createTables();
    for (const wxString& folder : {L"2,'" + in(L"").BeforeLast(L'\\'), L"6,'" + in(L"sub"), L"7,'" + in(L"b.txt")})
        service.database(L"taviconf.dat").execDML(L"INSERT INTO filesystem VALUES(" + folder + L"')");
    constexpr Coverage kNone = Coverage::none, kSome = Coverage::some, kAll = Coverage::all;
    using Summary = std::tuple<Coverage, Coverage, bool, wxString>; // versions, states, is there a folder, name
    const std::pair<PathSet, Summary> cases[] = {
        {{}, {kNone, kNone, false, L""}},
        {{in(L"a.txt")}, {kAll, kNone, false, L"a.txt"}},
        {{in(L"A.TXT")}, {kNone, kNone, false, L"A.TXT"}},
        {{in(L"sub")}, {kAll, kAll, true, L"sub"}},
        {{in(L"sub\\")}, {kAll, kAll, true, L""}},
        {{in(L"a.txt"), in(L"b.txt"), in(L"sub"), in(L"gone.txt")}, {kSome, kSome, true, L""}},
    };
    FolderStateTable states;
    for (const auto& [paths, summary] : cases) {
        Selection of{paths, kNone, kSome, true, L"?"};
        summarizeVersions(of, manifest.get());
        EXPECT_EQ(Summary(of.restoreMode, summarizeStates(paths, states), of.hasFolder, of.displayName), summary);
        summarizeVersions(of, nullptr);
        EXPECT_EQ(of.restoreMode, kNone);
        EXPECT_FALSE(of.hasFolder);
    }
    for (int i = 0; i < 20; ++i) { // the order of a set depends on the texts
        Selection of{{in(L"sub"), in(wxString::Format(L"%d", i))}, {}, {}, {}, {}};
        summarizeVersions(of, manifest.get());
        EXPECT_TRUE(of.hasFolder) << i;
    }
    service.database(L"taviconf.dat").execDML("DROP TABLE filesystem");
    EXPECT_EQ(summarizeStates({in(L"sub")}, states), kNone) << "a table that can no longer be read";
}

} // namespace
