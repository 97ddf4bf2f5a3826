#include "ui/Selection.h"

#include <algorithm>
#include <fstream>
#include <vector>

#include <gtest/gtest.h>
#include <sqlite3.h>

#include "core/Handles.h"
#include "core/Text.h"
#include "statedb/StateLookups.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using test::InstalledService;
using test::TemporaryFolder;

// A data object made by hand: it offers one block, and counts how often the block is given back.
class BlockData final : public IDataObject {
  public:
    explicit BlockData(std::vector<UINT> words) : words_(std::move(words)) {}
    STDMETHODIMP_(ULONG) Release() override
    {
        ++releases;
        return 1;
    }
    STDMETHODIMP GetData(FORMATETC* request, STGMEDIUM* medium) override
    {
        if (request->lindex != -1 || request->tymed != TYMED_HGLOBAL || request->dwAspect != DVASPECT_CONTENT)
            return DV_E_FORMATETC;
        const std::size_t bytes = words_.size() * sizeof(UINT);
        medium->tymed = TYMED_HGLOBAL;
        medium->hGlobal = GlobalAlloc(GMEM_MOVEABLE, bytes);
        medium->pUnkForRelease = this;
        std::copy(words_.begin(), words_.end(), static_cast<UINT*>(GlobalLock(medium->hGlobal)));
        GlobalUnlock(medium->hGlobal);
        return S_OK;
    }
    // clang-format off
    STDMETHODIMP QueryInterface(REFIID, void**) override { return E_NOINTERFACE; }
    STDMETHODIMP_(ULONG) AddRef() override { return 2; }
    STDMETHODIMP GetDataHere(FORMATETC*, STGMEDIUM*) override { return E_NOTIMPL; }
    STDMETHODIMP QueryGetData(FORMATETC*) override { return E_NOTIMPL; }
    STDMETHODIMP GetCanonicalFormatEtc(FORMATETC*, FORMATETC*) override { return E_NOTIMPL; }
    STDMETHODIMP SetData(FORMATETC*, STGMEDIUM*, BOOL) override { return E_NOTIMPL; }
    STDMETHODIMP EnumFormatEtc(DWORD, IEnumFORMATETC**) override { return E_NOTIMPL; }
    STDMETHODIMP DAdvise(FORMATETC*, DWORD, IAdviseSink*, DWORD*) override { return E_NOTIMPL; }
    STDMETHODIMP DUnadvise(DWORD) override { return E_NOTIMPL; }
    STDMETHODIMP EnumDAdvise(IEnumSTATDATA**) override { return E_NOTIMPL; }
    // clang-format on

    int releases = 0;

  private:
    std::vector<UINT> words_;
};

// The shell's own data object for items of one folder; all paths must have the same parent.
ComPtr<IDataObject> shellData(const std::vector<std::wstring>& paths)
{
    ComPtr<IShellFolder> parent;
    std::vector<LPITEMIDLIST> lists(paths.size());
    std::vector<LPCITEMIDLIST> children(paths.size());
    for (std::size_t i = 0; i < paths.size(); ++i) {
        EXPECT_EQ(SHParseDisplayName(paths[i].c_str(), nullptr, &lists[i], 0, nullptr), S_OK) << paths[i];
        SHBindToParent(lists[i], IID_IShellFolder, parent.outVoid(), &children[i]);
    }
    ComPtr<IDataObject> data;
    parent->GetUIObjectOf(nullptr, static_cast<UINT>(paths.size()), children.data(), IID_IDataObject, nullptr,
                          data.outVoid());
    std::for_each(lists.begin(), lists.end(), ILFree);
    return data;
}

UINT driveType = DRIVE_FIXED;
UINT WINAPI chosenDriveType(LPCWSTR)
{
    return driveType;
}

PathSet pathSet(const std::vector<std::wstring>& paths)
{
    return PathSet(paths.begin(), paths.end());
}

class SelectionTest : public testing::Test {
  protected:
    SelectionTest()
    {
        CreateDirectoryW((folder_.path() + L"\\sub").c_str(), nullptr);
        for (const wchar_t* name : {L"a.txt", L"b.txt", L"\u65e5\u672c.txt"})
            std::ofstream((folder_.path() + L"\\" + name).c_str());
        driveType = DRIVE_FIXED;
        OleInitialize(nullptr);
    }
    ~SelectionTest() override
    {
        OleUninitialize();
    }
    std::wstring in(const wchar_t* name) const
    {
        return folder_.path() + L"\\" + name;
    }

    test::LogCapture log_;
    InstalledService service_;
    TemporaryFolder folder_;
};

TEST_F(SelectionTest, TakesTheShellsItems)
{
    const std::vector<std::wstring> files = {in(L"a.txt"), in(L"\u65e5\u672c.txt"), in(L"sub")};
    EXPECT_EQ(collectPaths(nullptr, shellData(files).get(), chosenDriveType), pathSet(files));

    // A click on a folder's background: the folder is all there is.
    LPITEMIDLIST background = nullptr;
    ASSERT_EQ(SHParseDisplayName(folder_.path().c_str(), nullptr, &background, 0, nullptr), S_OK);
    EXPECT_EQ(collectPaths(background, nullptr, chosenDriveType), pathSet({folder_.path()}));
    EXPECT_EQ(collectPaths(background, shellData(files).get(), chosenDriveType).size(), 4u);
    ILFree(background);

    // Items without a path: the control panel and the recycle bin.
    for (const wchar_t* name : {L"::{20D04FE0-3AEA-1069-A2D8-08002B30309D}\\::{21EC2020-3AEA-1069-A2DD-08002B30309D}",
                                L"::{645FF040-5081-101B-9F08-00AA002F954E}"})
        EXPECT_TRUE(collectPaths(nullptr, shellData({name}).get(), chosenDriveType).empty());
}

TEST_F(SelectionTest, TakesRootsOfFixedDrivesOnly)
{
    for (const int type :
         {DRIVE_UNKNOWN, DRIVE_NO_ROOT_DIR, DRIVE_REMOVABLE, DRIVE_FIXED, DRIVE_REMOTE, DRIVE_CDROM, DRIVE_RAMDISK}) {
        driveType = static_cast<UINT>(type);
        EXPECT_EQ(collectPaths(nullptr, shellData({L"C:\\"}).get(), chosenDriveType),
                  type == DRIVE_FIXED ? pathSet({L"C:\\"}) : PathSet());
        EXPECT_EQ(collectPaths(nullptr, shellData({in(L"a.txt")}).get(), chosenDriveType), pathSet({in(L"a.txt")}));
    }
}

TEST_F(SelectionTest, NeverReadsOutsideAForgedBlock)
{
    EXPECT_TRUE(collectPaths(nullptr, nullptr, chosenDriveType).empty());
    // Counts and offsets beyond the block, and lists that do not end inside it.
    const std::vector<UINT> blocks[] = {{},
                                        {0},
                                        {1},
                                        {0, 8},
                                        {1, 12, 0x10000},
                                        {0x40000000, 0},
                                        {0xFFFFFFFF, 0},
                                        {0xFFFFFFFE, 0, 0},
                                        {1, 12, 14, 0x7FFF0000},
                                        {1, 12, 14, 0x00010000},
                                        {1, 0xFFFFFFFF, 0xFFFFFFF0, 0},
                                        {1, 12, 15, 0},
                                        {1, 12, 16, 0, 4, 4}};
    for (const auto& block : blocks) {
        BlockData data(block);
        EXPECT_TRUE(collectPaths(nullptr, &data, chosenDriveType).empty()) << testing::PrintToString(block);
        EXPECT_EQ(data.releases, 1);
    }
}

TEST_F(SelectionTest, TellsWhatHasVersions)
{
    const std::wstring base = folder_.path();
    const ManifestRef manifest(Manifest::Parse(
        wxString(L"FILES\n" + base + L"\\a.txt\n5:5:5:9:0::0:0\n6:6:6:-1:0::0:0\n\n" + base +
                 L"\\sub\\deep\\c.txt\n5:5:5:9:0::0:0\n\n" + base + L"\\gone.txt\n5:5:5:9:0::0:0\n\n")));
    ASSERT_TRUE(manifest);
    manifest.get()->AddRef();
    const struct {
        std::vector<std::wstring> paths;
        int restoreMode;
        bool isFolder;
        const wchar_t* name;
    } cases[] = {
        {{}, 0, false, L""},
        {{in(L"a.txt")}, 1, false, L"a.txt"},
        {{in(L"A.TXT")}, 0, false, L"A.TXT"},
        {{in(L"b.txt")}, 0, false, L"b.txt"},
        {{in(L"gone.txt")}, 1, false, L"gone.txt"},
        {{in(L"sub")}, 1, true, L"sub"},
        {{in(L"sub\\")}, 1, true, L""},
        {{in(L"su")}, 0, false, L"su"},
        {{in(L"a.txt"), in(L"b.txt")}, -1, false, L""},
        {{in(L"a.txt"), in(L"b.txt"), in(L"sub"), in(L"gone.txt")}, -1, true, L""},
        {{in(L"a.txt"), in(L"sub")}, 1, true, L""},
        {{L"C:\\"}, base[0] == L'C' ? 1 : 0, true, L""},
    };
    for (const auto& test : cases) {
        Selection selection;
        selection.isFolder = true;
        selection.paths = pathSet(test.paths);
        summarizeVersions(selection, manifest.get());
        EXPECT_EQ(selection.restoreMode, test.restoreMode) << testing::PrintToString(test.paths);
        EXPECT_EQ(selection.isFolder, test.isFolder) << testing::PrintToString(test.paths);
        EXPECT_EQ(selection.displayName.ToStdWstring(), test.name);
        summarizeVersions(selection, nullptr);
        EXPECT_EQ(selection.restoreMode, 0);
        EXPECT_FALSE(selection.isFolder);
    }
}

TEST_F(SelectionTest, SummarizesFolderStates)
{
    sqlite3* database = nullptr;
    ASSERT_EQ(sqlite3_open(toUtf8(service_.file(L"taviconf.dat")).c_str(), &database), SQLITE_OK);
    const auto run = [&](const char* sql) {
        ASSERT_EQ(sqlite3_exec(database, sql, nullptr, nullptr, nullptr), SQLITE_OK);
    };
    run("CREATE TABLE filesystem(folder TEXT PRIMARY KEY, state INTEGER);"
        "INSERT INTO filesystem VALUES('C:\\six',6),('C:\\one',1),('C:\\two',2)");
    {
        FolderStateTable states;
        const struct {
            std::vector<std::wstring> paths;
            int summary;
        } cases[] = {{{}, 0},
                     {{L"C:\\six"}, 1},
                     {{L"C:\\six", L"C:\\one\\below"}, 1},
                     {{L"C:\\two", L"C:\\one", L"D:\\none"}, 0},
                     {{L"C:\\six", L"C:\\two", L"C:\\six\\below"}, -1}};
        for (const auto& test : cases)
            EXPECT_EQ(summarizeStates(pathSet(test.paths), states), test.summary) << testing::PrintToString(test.paths);
        // A table that can no longer be read: every item is of the second kind.
        run("DROP TABLE filesystem");
        EXPECT_EQ(summarizeStates(pathSet({L"C:\\six"}), states), 0);
    }
    sqlite3_close(database);
}

} // namespace
} // namespace tavi
