#include "ui/Selection.h"

#include "statedb/StateLookups.h"
#include "tests/support/Dialogs.h"

using namespace tavi;

namespace {

using SelectionTest = test::UiTest;
using IdList = std::shared_ptr<ITEMIDLIST>;

IdList idsOf(const wxString& path)
{
    return IdList(ILCreateFromPathW(path.wc_str()), ILFree);
}

UINT driveType = DRIVE_REMOTE;
UINT WINAPI chosenDriveType(LPCWSTR)
{
    return driveType;
}

// Returns what is collected from the shell's own data object for the last ids of the items.
PathSet collect(const wxString& parent, const std::vector<IdList>& items, const IdList& background = {})
{
    std::vector<LPCITEMIDLIST> lists;
    for (const IdList& item : items)
        lists.push_back(ILFindLastID(item.get()));
    RefPtr<IDataObject> data;
    CIDLData_CreateFromIDArray(idsOf(parent).get(), UINT(lists.size()), lists.data(), data.out());
    return collectPaths(background.get(), data.get(), chosenDriveType);
}

TEST_F(SelectionTest, TakesTheShellsItemsButNoneTooLong)
{
    const wxString parent = in(wxString(L'd', 200 - in(L"").size())), name = L"00000" + wxString(L'f', 53),
                   rare = parent + L"\\\u65e5\U0001F4BE", sub = parent + L"\\sub";
    std::filesystem::create_directories(sub.wc_str());
    for (const wxString& each : {in(name), in(name + L"f"), rare})
        std::ofstream(each.wc_str());
    std::vector<IdList> items{idsOf(in(name)), idsOf(in(name + L"f")), idsOf(rare), idsOf(sub)};
    // Copies of the first one, each with another number in its name.
    const std::string bytes(reinterpret_cast<const char*>(items[0].get()), ILGetSize(items[0].get()));
    const std::size_t place = bytes.find(std::string(reinterpret_cast<const char*>(name.wx_str()), 20));
    for (int i = 10001; i < 80000; ++i) {
        items.emplace_back(ILClone(items[0].get()), ILFree);
        std::memcpy(reinterpret_cast<char*>(items.back().get()) + place, std::to_wstring(i).c_str(), 10);
    }
    const PathSet paths = collect(parent, items, idsOf(parent));
    EXPECT_EQ(paths.size(), 70003u);
    for (const wxString& path : {parent, rare, sub, parent + L"\\79999" + name.substr(5)})
        EXPECT_EQ(paths.count(path), 1u) << path;
}

TEST_F(SelectionTest, TakesNoVirtualItemAndNoDriveThatIsNotFixed)
{
    const wxString computer = L"::{20D04FE0-3AEA-1069-A2D8-08002B30309D}";
    const IdList controlPanel = idsOf(computer + L"\\::{21EC2020-3AEA-1069-A2DD-08002B30309D}");
    for (driveType = DRIVE_UNKNOWN; driveType <= DRIVE_RAMDISK; ++driveType)
        EXPECT_EQ(collect(computer, {controlPanel, idsOf(L"C:\\")}).size(), driveType == DRIVE_FIXED ? 1u : 0u);
}

TEST_F(SelectionTest, NeverReadsOutsideAForgedBlock)
{
    // Counts and offsets beyond the block, and lists that do not end inside it.
    const auto format = CLIPFORMAT(RegisterClipboardFormatW(CFSTR_SHELLIDLIST));
    FORMATETC request{format, nullptr, DVASPECT_CONTENT, -1, TYMED_HGLOBAL};
    for (const auto& block : {std::vector<UINT>{1},
                              {1 << 30, 0},
                              {~1u, 0, 0},
                              {1, 12, 15, 0},
                              {1, 12, 14, 1 << 16},
                              {1, 12, 14, 0x7FFF0000},
                              {1, ~0u, ~15u, 0}}) {
        DWORD connection = 0;
        STGMEDIUM medium{TYMED_HGLOBAL, {}, nullptr};
        medium.hGlobal = GlobalAlloc(GMEM_FIXED, block.size() * sizeof(UINT));
        std::copy(block.begin(), block.end(), static_cast<UINT*>(medium.hGlobal));
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
    service.database(L"taviconf.dat").execDML("DROP TABLE filesystem");
    EXPECT_EQ(summarizeStates({in(L"sub")}, states), kNone) << "a table that can no longer be read";
}

TEST_F(SelectionTest, FindsAFolderAtAnyPlaceAmongTheItems)
{
    CreateDirectoryW(in(L"sub").wc_str(), nullptr);
    const ManifestRef manifest = Manifest::parse(wxString());
    for (int i = 0; i < 20; ++i) { // the order of a set depends on the texts
        Selection summary;
        summary.paths = {in(L"sub"), in(wxString::Format(L"%d", i))};
        summarizeVersions(summary, manifest.get());
        const auto& [paths, states, versions, hasFolder, name] = summary;
        EXPECT_TRUE(hasFolder) << i;
    }
}

} // namespace
