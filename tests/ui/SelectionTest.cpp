#include "ui/Selection.h"

#include <algorithm>
#include <fstream>
#include <vector>

#include <gtest/gtest.h>

#include "core/Handles.h"
#include "statedb/Database.h"
#include "statedb/StateLookups.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

// The shell's id list of a path, or the last id of it, as bytes.
std::string idsOf(const wxString& path, bool lastOnly = false)
{
    LPITEMIDLIST list = nullptr;
    EXPECT_EQ(SHParseDisplayName(path.wc_str(), nullptr, &list, 0, nullptr), S_OK) << path;
    const LPCITEMIDLIST from = lastOnly ? ILFindLastID(list) : list;
    const std::string ids(reinterpret_cast<const char*>(from), ILGetSize(from));
    ILFree(list);
    return ids;
}

LPCITEMIDLIST asList(const std::string& ids)
{
    return reinterpret_cast<LPCITEMIDLIST>(ids.data());
}

UINT driveType = DRIVE_FIXED;
UINT WINAPI chosenDriveType(LPCWSTR)
{
    return driveType;
}

// What is taken from the shell's own data object for items of a folder.
PathSet collect(const wxString& parent, const std::vector<std::string>& items, LPCITEMIDLIST background = nullptr)
{
    std::vector<LPCITEMIDLIST> lists;
    std::transform(items.begin(), items.end(), std::back_inserter(lists), asList);
    ComPtr<IShellFolder> desktop, folder;
    ComPtr<IDataObject> data;
    SHGetDesktopFolder(desktop.out());
    desktop->BindToObject(asList(idsOf(parent)), nullptr, IID_IShellFolder, folder.outVoid());
    folder->GetUIObjectOf(nullptr, UINT(lists.size()), lists.data(), IID_IDataObject, nullptr, data.outVoid());
    return collectPaths(background, data.get(), chosenDriveType);
}

struct SelectionTest : testing::Test {
    SelectionTest()
    {
        CreateDirectoryW(in(L"sub").wc_str(), nullptr);
        std::ofstream(in(L"a.txt").wc_str());
        driveType = DRIVE_FIXED;
    }
    wxString in(const wxString& name) const
    {
        return folder.path() + L"\\" + name;
    }

    test::LogCapture log;
    test::InstalledService service;
    test::TemporaryFolder folder;
};

TEST_F(SelectionTest, TakesTheShellsItems)
{
    const wxString here = folder.path(), rare = in(L"\u65e5\U0001F4BE.txt"),
                   computer = L"::{20D04FE0-3AEA-1069-A2D8-08002B30309D}",
                   controlPanel = computer + L"\\::{21EC2020-3AEA-1069-A2DD-08002B30309D}";
    std::ofstream(rare.wc_str());
    const std::vector<std::string> items = {idsOf(in(L"a.txt"), true), idsOf(rare, true), idsOf(in(L"sub"), true)};
    EXPECT_EQ(collect(here, items), PathSet({in(L"a.txt"), rare, in(L"sub")}));
    // A click on a folder's background: the folder is all there is.
    const std::string background = idsOf(here);
    EXPECT_EQ(collectPaths(asList(background), nullptr, chosenDriveType), PathSet({here}));
    EXPECT_EQ(collect(here, items, asList(background)).size(), 4u);
    // Of what is no file, roots of fixed drives only.
    for (driveType = DRIVE_UNKNOWN; driveType <= DRIVE_RAMDISK; ++driveType) {
        EXPECT_EQ(collect(computer, {idsOf(controlPanel, true), idsOf(L"C:\\", true)}),
                  driveType == DRIVE_FIXED ? PathSet({L"C:\\"}) : PathSet());
        EXPECT_EQ(collect(here, items).size(), 3u);
    }
}

TEST_F(SelectionTest, TakesManyItemsButNoneTooLong)
{
    const wxString parent = in(wxString(L'd', 199 - folder.path().size())), name = L"00000" + wxString(L'f', 53);
    CreateDirectoryW(parent.wc_str(), nullptr);
    std::vector<std::string> items;
    for (const wxString& each : {name, name + L"f"}) {
        std::ofstream(in(each).wc_str());
        items.push_back(idsOf(in(each), true));
    }
    // The first one again and again, each with another number in its name.
    const auto bytes = [](const wxString& text) {
        return std::string(reinterpret_cast<const char*>(text.wx_str()), 10);
    };
    std::string item = items[0];
    for (int i = 10001; i < 80000; ++i)
        items.push_back(item.replace(items[0].find(bytes(name)), 10, bytes(std::to_wstring(i))));
    const DWORD start = GetTickCount();
    const PathSet paths = collect(parent, items);
    EXPECT_LT(GetTickCount() - start, 3000u);
    EXPECT_EQ(paths.size(), 70000u);
    EXPECT_EQ(paths.count(parent + L"\\79999" + name.substr(5)), 1u);
}

TEST_F(SelectionTest, NeverReadsOutsideAForgedBlock)
{
    // Counts and offsets beyond the block, and lists that do not end inside it.
    const std::vector<UINT> blocks[] = {{0},
                                        {1},
                                        {0, 8},
                                        {1, 12, 0x10000},
                                        {0x40000000, 0},
                                        {0xFFFFFFFF, 0},
                                        {0xFFFFFFFE, 0, 0},
                                        {1, 12, 15, 0},
                                        {1, 12, 14, 0x7FFF0000},
                                        {1, 12, 14, 0x00010000},
                                        {1, 0xFFFFFFFF, 0xFFFFFFF0, 0},
                                        {1, 12, 16, 0, 4, 4}};
    FORMATETC format{static_cast<CLIPFORMAT>(RegisterClipboardFormatW(L"Shell IDList Array")), nullptr,
                     DVASPECT_CONTENT, -1, TYMED_HGLOBAL};
    for (const auto& block : blocks) {
        // OLE's own store of data takes any block.
        ComPtr<IOleCache> cache;
        ComPtr<IDataObject> data;
        CreateDataCache(nullptr, CLSID_NULL, IID_IOleCache, cache.outVoid());
        STGMEDIUM medium{TYMED_HGLOBAL, {}, nullptr};
        medium.hGlobal = GlobalAlloc(GMEM_MOVEABLE, block.size() * sizeof(UINT));
        std::copy(block.begin(), block.end(), static_cast<UINT*>(GlobalLock(medium.hGlobal)));
        GlobalUnlock(medium.hGlobal);
        DWORD connection = 0;
        cache->Cache(&format, 0, &connection);
        EXPECT_EQ(cache->SetData(&format, &medium, TRUE), S_OK);
        cache->QueryInterface(IID_IDataObject, data.outVoid());
        EXPECT_EQ(data->GetData(&format, &medium), S_OK);
        ReleaseStgMedium(&medium);
        EXPECT_TRUE(collectPaths(nullptr, data.get(), chosenDriveType).empty()) << testing::PrintToString(block);
    }
}

TEST_F(SelectionTest, SummarizesVersionsAndStates)
{
    const ManifestRef manifest(Manifest::Parse(L"FILES\n" + in(L"a.txt\n5:5:5:9:0::0:0\n6:6:6:-1:0::0:0\n\n") +
                                               in(L"sub\\deep\\c.txt\n5:5:5:9:0::0:0\n")));
    manifest.get()->AddRef();
    DbConnection database;
    database.open(service.file(L"taviconf.dat"));
    database.execDML("CREATE TABLE filesystem(folder TEXT PRIMARY KEY, state INTEGER)");
    for (const wxString& value : {folder.path() + L"',2", in(L"sub',6"), in(L"b.txt',7")})
        database.execDML(L"INSERT INTO filesystem VALUES('" + value + L")");
    const struct {
        PathSet paths;
        int restoreMode, states;
        bool isFolder;
        const wchar_t* name;
    } cases[] = {
        {{}, 0, 0, false, L""},
        {{in(L"a.txt")}, 1, 0, false, L"a.txt"},
        {{in(L"A.TXT")}, 0, 0, false, L"A.TXT"},
        {{in(L"sub")}, 1, 1, true, L"sub"},
        {{in(L"sub\\")}, 1, 1, true, L""},
        {{in(L"su")}, 0, 0, false, L"su"},
        {{in(L"a.txt"), in(L"b.txt")}, -1, -1, false, L""},
        {{in(L"a.txt"), in(L"b.txt"), in(L"sub"), in(L"gone.txt")}, -1, -1, true, L""},
        {{in(L"sub\\deep\\c.txt"), in(L"sub")}, 1, 1, true, L""},
    };
    FolderStateTable states;
    for (const auto& test : cases) {
        Selection selection{test.paths, 0, 5, true, L"?"};
        summarizeVersions(selection, manifest.get());
        EXPECT_EQ(selection.restoreMode, test.restoreMode) << &test - cases;
        EXPECT_EQ(selection.isFolder, test.isFolder) << &test - cases;
        EXPECT_EQ(selection.displayName, test.name);
        EXPECT_EQ(summarizeStates(selection.paths, states), test.states) << &test - cases;
        summarizeVersions(selection, nullptr);
        EXPECT_TRUE(selection.restoreMode == 0 && !selection.isFolder);
    }
    // A table that can no longer be read: every item is of the second kind.
    database.execDML("DROP TABLE filesystem");
    EXPECT_EQ(summarizeStates({in(L"sub")}, states), 0);
}

} // namespace
} // namespace tavi
