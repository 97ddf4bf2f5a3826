#include "ui/VersionsDialog.h"

#include <cstdlib>
#include <ctime>

#include <commctrl.h>
#include <dlgs.h>
#include <shlobj.h>

#include "tests/support/Dialogs.h"
#include "ui/resource.h"
#include "ui/RestoreProgressWindow.h"
#include "ui/VersionsWindow.h"

namespace tavi {
namespace {

using namespace test;

void setTimeZone(const char* zone)
{
    _putenv_s("TZ", zone);
    _tzset();
}

struct VersionsDialogTest : UiTest {
    void open(const PathSet& paths, bool hasFolder, const wxString& files)
    {
        const Coverage versions = paths.size() == 1 ? Coverage::all : Coverage::some;
        openVersionsWindow({paths, {}, versions, hasFolder, {}}, Manifest::parse(L"FILES\n" + files), nullptr);
        dialog = waitDialog(L"Restore Files");
        list = GetDlgItem(dialog, TAVI_VERSIONS_LIST);
    }
    int enabledActions() const
    {
        return IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_RESTORE)) +
               IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_COPY_TO));
    }
    // Returns title, width and text of the first row for each column.
    std::wstring columns() const
    {
        std::wstring all;
        wchar_t title[50], text[50];
        LVCOLUMNW column{LVCF_TEXT | LVCF_WIDTH, 0, 0, title, 50, 0, 0, 0, 0, 0, 0};
        for (int i = 0; ListView_GetColumn(list, i, &column); ++i) {
            ListView_GetItemText(list, 0, i, text, 50);
            all += std::wstring(title) + L' ' + std::to_wstring(column.cx) + L" [" + text + L"] ";
        }
        return all;
    }
    HWND dialog = nullptr, list = nullptr;
};

TEST_F(VersionsDialogTest, ListsEachRunOnceAndSelectsTheNewest)
{
    setTimeZone("XYZ-5");
    const wxString longName = L"begin" + wxString(L'x', 200) + L"end.txt",
                   files = L"C:\\d\\50% & more.txt\n4:86465:1:10:0::0:0\n4:1:1:11:0::0:0\n5:1:1:-1:0::0:0\n"
                           L"6:5:1:9:0::0:0\n\nC:\\d\\" +
                           longName +
                           L"\n5:86465:5:10:0::0:0\n6:5:5:-1:0::0:0\n\n"
                           L"simple.map\n4:1:1:1:0::0:0\n5:1:1:1:0::0:0\n6:1:1:1:0::0:0";
    const std::tuple<PathSet, bool, std::wstring, int, int> cases[] = {
        {{L"C:\\d\\50% & more.txt"}, false, L"50% & more.txt are*", 2, 1},
        {{L"C:\\d\\" + longName}, false, L"beginxx*xend.txt are*", 1, -1},
        {{L"C:\\d"}, true, L"the items you selected are*", 3, 2},
        {{L"C:\\a", L"C:\\b"}, true, L"some of the items you selected are*", 3, 2},
    };
    for (const auto& [paths, hasFolder, pattern, rows, selected] : cases) {
        open(paths, hasFolder, files);
        const wxString message = controlText(dialog, TAVI_VERSIONS_MESSAGE);
        EXPECT_TRUE(message.Matches(L"The following versions of " + pattern)) << message;
        EXPECT_LT(message.length(), 250u);
        EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_LABEL), hasFolder ? L"Available &Versions:" : L"File &Versions:");
        EXPECT_EQ(ListView_GetItemCount(list), rows);
        EXPECT_EQ(ListView_GetNextItem(list, -1, LVNI_SELECTED), selected);
        EXPECT_EQ(enabledActions(), selected < 0 ? 0 : 2);
        for (const UINT state : {LVIS_SELECTED, 0}) {
            ListView_SetItemState(list, rows - 1, state, LVIS_SELECTED);
            EXPECT_EQ(enabledActions(), state == 0 ? 0 : 2);
        }
        SIZE ideal{};
        EXPECT_TRUE(Button_GetIdealSize(GetDlgItem(dialog, IDCANCEL), &ideal)) << "a button of version 6";
        // Of two versions of one run, the first.
        EXPECT_EQ(columns(), hasFolder ? L"Backup Time 125 [01/01/1970 05:00 AM] "
                                       : L"Backup Time 125 [01/01/1970 05:00 AM] "
                                         L"Modified Time 125 [01/02/1970 05:01 AM] File Size 75 [10 bytes] ");
        PostMessageW(list, WM_KEYDOWN, VK_ESCAPE, 0);
        waitForThreads();
    }
    setTimeZone("UTC0");
}

// The browser shows itself before it has opened the folder that it starts with.
void chooseFolder(HWND browser, const wxString& folder)
{
    const HWND tree = FindWindowExW(browser, nullptr, WC_TREEVIEWW, nullptr);
    EXPECT_TRUE(!tree || waitUntil([&] {
        SendMessageW(browser, BFFM_SETSELECTIONW, TRUE, reinterpret_cast<LPARAM>(folder.wc_str()));
        wchar_t name[MAX_PATH] = L"";
        TVITEMW item{TVIF_TEXT, TreeView_GetSelection(tree), 0, 0, name, MAX_PATH, 0, 0, 0, 0};
        return TreeView_GetItem(tree, &item) && folder.AfterLast(L'\\') == name;
    }));
}

// In folder "f" there is a file, and it and one deeper are backed up. Folder "t" is for the targets.
struct VersionsRequestTest : VersionsDialogTest {
    VersionsRequestTest()
    {
        for (const wchar_t* name : {L"f", L"t"})
            CreateDirectoryW(in(name).wc_str(), nullptr);
        for (const wchar_t* name : {L"f\\5%", L"t\\was", L"t\\5%"})
            std::ofstream(in(name).wc_str());
        service.createTables();
    }
    // Gives the answer to the box that the dialog has opened, after a choice of "t\was" or of folder "t".
    void answer(HWND box, int button, const std::wstring& question)
    {
        if (GetDlgItem(box, cmb13)) {
            EXPECT_EQ(controlText(box, cmb13), L"5%");
            SetDlgItemTextW(box, cmb13, in(L"t\\was").wc_str());
        }
        chooseFolder(box, in(L"t"));
        EXPECT_TRUE(button == IDOK || controlText(box, 0xFFFF).find(question) != std::wstring::npos);
        button == kCloseWindow ? PostMessageW(dialog, WM_CLOSE, 0, 0) : click(box, button);
    }
    // Returns the stored requests, relative to the folder, and removes them: source, time, attributes, target,
    // overwrite.
    wxString takeRequests()
    {
        DbConnection database = service.database(L"tavistate.dat");
        const char* text = nullptr;
        database
            .execQuery("SELECT ifnull(group_concat(manifest_path || ' ' || timestamp || ' ' || attributes || ' ' || "
                       "target_path || ' ' || overwrite, ';'), '') FROM restore_files")
            .fieldText(0, text);
        wxString requests = fromUtf8(text);
        requests.Replace(in(L""), L"");
        database.execDML("DELETE FROM restore_files");
        return requests;
    }
    static constexpr int kRestore = TAVI_VERSIONS_RESTORE, kCopy = TAVI_VERSIONS_COPY_TO, kCloseWindow = 0;
};

TEST_F(VersionsRequestTest, StoresWhatTheAnswersSay)
{
    const wxString files = in(L"f\\5%\n100:1:7:1:0::0:40\n200:1:8:2:0::0:41\n\n") +
                           in(L"f\\b\\c\n100:1:7:3:0::0:0\n\n") + L"simple.map\n100:1:1:1:0::0:0";
    const PathSet one = {in(L"f\\5%")}, whole = {in(L"f")}, several = {in(L"f\\5%"), in(L"f\\b")},
                  fresh = {in(L"f\\b"), in(L"f\\x")};
    const auto currentFolder = std::filesystem::current_path();
    // The selection, the row, the button, the answer to each box, words of the last question, the request. A chosen
    // folder ends in a backslash; the rest of a path below it begins with one.
    const std::tuple<const PathSet&, int, int, std::vector<int>, const wchar_t*, const wchar_t*> cases[] = {
        {one, 0, kRestore, {IDYES}, L"Restoring this file", LR"(f\5% 100 32 f\5% 1)"},
        {one, 1, kRestore, {IDNO}, L"Restoring this file", LR"(f\5% 200 33 f\5% (1) 0)"},
        {one, 1, kRestore, {IDCANCEL}, L"Restoring this file", L""},
        {one, 1, kRestore, {kCloseWindow}, L"Restoring this file", L""},
        {whole, 0, kRestore, {IDYES}, L"they were last backed up", LR"(f\5% 100 32 f\5% 1;f\b\c 100 0 f\b\c 1)"},
        // The save box itself asks about an existing file.
        {one, 1, kCopy, {IDOK, IDYES}, L"", LR"(f\5% 200 33 t\was 1)"},
        {one, 1, kCopy, {IDCANCEL}, L"", L""},
        {fresh, 0, kCopy, {IDOK}, L"", LR"(f\b\c 100 0 t\\b\c 0)"},
        {several, 0, kCopy, {IDOK, IDYES}, L"already exist", LR"(f\5% 100 32 t\\5% 1;f\b\c 100 0 t\\b\c 1)"},
        {several, 0, kCopy, {IDOK, IDNO}, L"already exist", LR"(f\5% 100 32 t\\5% (1) 0;f\b\c 100 0 t\\b\c 0)"},
        {several, 0, kCopy, {IDOK, IDCANCEL}, L"already exist", L""},
        {whole, 0, kCopy, {IDOK, IDYES}, L"already exist", LR"(f\5% 100 32 t\\5% 1;f\b\c 100 0 t\\b\c 1)"},
    };
    for (const auto& [paths, row, button, answers, question, request] : cases) {
        SCOPED_TRACE(request);
        open(paths, paths != one, files);
        ListView_SetItemState(list, row, LVIS_SELECTED, LVIS_SELECTED);
        click(dialog, button);
        HWND box = nullptr;
        for (const int each : answers) {
            box = waitDialog(nullptr, dialog, box);
            answer(box, each, question);
        }
        EXPECT_TRUE(waitUntil([&] { return !IsWindow(dialog); }));
        const auto progress = RestoreProgressWindow::current();
        EXPECT_EQ(progress != nullptr, *request != 0);
        if (progress && waitUntil([&] { return progress->dialog() != nullptr; }))
            PostMessageW(progress->dialog(), WM_CLOSE, 0, 0);
        waitForThreads();
        EXPECT_EQ(takeRequests(), request);
        EXPECT_EQ(std::filesystem::current_path(), currentFolder) << "of the host";
    }
}

} // namespace
} // namespace tavi
