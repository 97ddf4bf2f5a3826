#include "ui/VersionsDialog.h"

#include <cstdlib>
#include <ctime>
#include <thread>

#include <commctrl.h>
#include <dlgs.h>
#include <shlobj.h>

#include "tests/support/Dialogs.h"
#include "ui/CopyTarget.h"
#include "ui/PropertyPage.h"
#include "ui/resource.h"
#include "ui/VersionsWindow.h"

using namespace tavi;

namespace {

using namespace test;

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
    HWND dialog = nullptr, list = nullptr;
};

TEST_F(VersionsDialogTest, ListsEachRunOnceAndSelectsTheNewest)
{
    _putenv_s("TZ", "XYZ-5");
    _tzset();
    const wxString longName = L"begin" + wxString(L'x', 200) + L"end.txt",
                   files = L"C:\\d\\50% & more.txt\n4:86465:1:10:0::0:0\n4:1:1:11:0::0:0\n5:1:1:-1:0::0:0\n"
                           L"6:5:1:9:0::0:0\n\nC:\\d\\" +
                           longName +
                           L"\n5:86465:5:10:0::0:0\n6:5:5:-1:0::0:0\n\n"
                           L"simple.map\n4:1:1:1:0::0:0\n5:1:1:1:0::0:0\n6:1:1:1:0::0:0";
    const std::tuple<PathSet, bool, std::wstring, int, int> cases[] = {
        {{L"C:\\d\\50% & more.txt"}, false, L"50% & more.txt are*", 2, 1},
        {{L"C:\\d\\" + longName}, false, L"beginxx*x\u2026x*xend.txt are*", 1, -1},
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
        ListView_SetItemState(list, rows - 1, selected < 0 ? LVIS_SELECTED : 0u, LVIS_SELECTED);
        EXPECT_EQ(enabledActions(), selected < 0 ? 2 : 0);
        SIZE ideal{};
        EXPECT_TRUE(Button_GetIdealSize(GetDlgItem(dialog, IDCANCEL), &ideal)) << "a button of version 6";
        std::wstring columns;
        for (int i = 0; i < 3; ++i) {
            wchar_t text[50] = L"";
            ListView_GetItemText(list, 0, i, text, 50);
            columns += std::to_wstring(ListView_GetColumnWidth(list, i)) + L": " + text + L"; ";
        }
        // Of two versions of one run, the first.
        EXPECT_EQ(columns, hasFolder ? L"125: 01/01/1970 05:00 AM; 0: ; 0: ; "
                                     : L"125: 01/01/1970 05:00 AM; 125: 01/02/1970 05:01 AM; 75: 10 bytes; ");
        PostMessageW(list, WM_KEYDOWN, VK_ESCAPE, 0);
        waitForThreads();
    }
    _putenv_s("TZ", "UTC0");
    _tzset();
}

TEST_F(VersionsDialogTest, CopiesFromTheFoldersThatAllPathsShare)
{
    const wxString deep = L"C:\\" + wxString(L'd', 300);
    EXPECT_EQ(commonPrefix({L"C:\\a\\xx", L"C:\\a\\xy"}), L"C:\\a");
    EXPECT_EQ(commonPrefix({L"C:\\a", L"C:\\a\\X"}), L"C:\\a");
    EXPECT_EQ(commonPrefix({L"C:\\n", L"D:\\n"}), L"");
    EXPECT_EQ(commonPrefix({L"C:\\a\\b\\n", L"C:\\a\\b\\m", L"C:\\a\\x"}), L"C:\\a");
    EXPECT_EQ(commonPrefix({deep + L"\\n", deep + L"\\m"}), deep);
}

// In folder "f" there is a file, and it and one deeper are backed up. Folder "t" is for the targets.
TEST_F(VersionsDialogTest, StoresWhatTheAnswersSay)
{
    for (const wchar_t* name : {L"f", L"t"})
        CreateDirectoryW(in(name).wc_str(), nullptr);
    for (const wchar_t* name : {L"f\\5%", L"t\\was", L"t\\5%"})
        std::ofstream(in(name).wc_str());
    service.createTables();
    DbConnection database = service.database(L"tavistate.dat");
    constexpr int kRestore = TAVI_VERSIONS_RESTORE, kCopy = TAVI_VERSIONS_COPY_TO, kCloseWindow = 0;
    const wxString files = in(L"f\\5%\n100:1:7:1:0::0:40\n200:1:8:2:0::0:41\n\n") +
                           in(L"f\\b\\c\n100:1:7:3:0::0:0\n\n") + L"simple.map\n100:1:1:1:0::0:0";
    const PathSet one = {in(L"f\\5%")}, whole = {in(L"f")}, several = {in(L"f\\5%"), in(L"f\\b")},
                  fresh = {in(L"f\\b"), in(L"f\\x")};
    const auto currentFolder = std::filesystem::current_path();
    // The selection, row, button, answers, words of the last question, request. A chosen folder ends in a backslash.
    const std::tuple<const PathSet&, int, int, std::vector<int>, const wchar_t*, const wchar_t*> cases[] = {
        {one, 0, kRestore, {IDYES}, L"Restoring this file", LR"(f\5% 100 32 f\5% 1)"},
        {one, 1, kRestore, {IDNO}, L"Restoring this file", LR"(f\5% 200 33 f\5% (1) 0)"},
        {one, 1, kRestore, {IDCANCEL}, L"Restoring this file", L""},
        {one, 1, kRestore, {kCloseWindow}, L"Restoring this file", L""},
        {whole, 0, kRestore, {IDYES}, L"they were last backed up", LR"(f\5% 100 32 f\5% 1;f\b\c 100 0 f\b\c 1)"},
        {one, 1, kCopy, {IDOK, IDYES}, L"already exists", LR"(f\5% 200 33 t\was 1)"},
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
            if (GetDlgItem(box, cmb13)) {
                EXPECT_EQ(controlText(box, cmb13), L"5%");
                SetDlgItemTextW(box, cmb13, in(L"t\\was").wc_str());
            }
            // The browser shows itself before it has opened the folder that it starts with.
            const HWND tree = FindWindowExW(box, nullptr, WC_TREEVIEWW, nullptr);
            EXPECT_TRUE(!tree || waitUntil([&] {
                SendMessageW(box, BFFM_SETSELECTIONW, TRUE, reinterpret_cast<LPARAM>(in(L"t").wc_str()));
                wchar_t name[MAX_PATH] = L"";
                TVITEMW item{TVIF_TEXT, TreeView_GetSelection(tree), 0, 0, name, MAX_PATH, 0, 0, 0, 0};
                return TreeView_GetItem(tree, &item) && std::wstring(name) == L"t";
            }));
            EXPECT_TRUE(each == IDOK || controlText(box, 0xFFFF).find(question) != std::wstring::npos);
            each == kCloseWindow ? PostMessageW(dialog, WM_CLOSE, 0, 0) : click(box, each);
        }
        if (*request)
            PostMessageW(waitDialog(L"Restoring..."), WM_CLOSE, 0, 0);
        waitForThreads();
        // Source, time, attributes, target, overwrite; relative to the folder.
        DbQuery stored = database.execQuery("SELECT ifnull(group_concat(manifest_path || ' ' || timestamp || ' ' || "
                                            "attributes || ' ' || target_path || ' ' || overwrite, ';'), '') "
                                            "FROM restore_files");
        const char* text = nullptr;
        stored.fieldText(0, text);
        wxString requests = fromUtf8(text);
        requests.Replace(in(L""), L"");
        EXPECT_EQ(requests, request);
        database.execDML("DELETE FROM restore_files");
        EXPECT_EQ(std::filesystem::current_path(), currentFolder) << "of the host";
    }
}

using PropertyPageTest = UiTest;

HPROPSHEETPAGE pageFor(const PathSet& paths, bool isAccepted = true)
{
    HPROPSHEETPAGE page = nullptr;
    addPropertyPage({paths, {}, {}, false, {}},
                    Manifest::parse(L"FILES\nC:\\f\n5:5:5:5:0::0:0\n\nC:\\gone\n5:5:5:5:0::0:0\n6:5:5:-1:0::0:0"),
                    takePage, isAccepted ? reinterpret_cast<LPARAM>(&page) : 0);
    return page;
}

HWND openSheet(HWND owner = nullptr)
{
    HPROPSHEETPAGE page = pageFor({L"C:\\f"});
    PROPSHEETHEADERW header{sizeof(header), PSH_MODELESS, owner, nullptr, {}, nullptr, 1, {}, {}, nullptr, {}, {}, {}};
    header.phpage = &page;
    return reinterpret_cast<HWND>(PropertySheetW(&header));
}

// Wine ignores the page's reference counter. Windows adds one to each module count below while its page exists.
TEST_F(PropertyPageTest, IsOfferedForABackedUpFileAndDestroyedOnce)
{
    for (const auto& [paths, count] :
         {std::pair<PathSet, int>({L"C:\\"}, 0), {{L"C:\\gone"}, 0}, {{L"C:\\none", L"C:\\f"}, 1}}) {
        const HPROPSHEETPAGE page = pageFor(paths);
        EXPECT_EQ(moduleRefCount(), count);
        DestroyPropertySheetPage(page);
        EXPECT_EQ(moduleRefCount(), 0);
    }
    pageFor({L"C:\\f"}, false);
    EXPECT_EQ(moduleRefCount(), 0);
}

TEST_F(PropertyPageTest, EndsWithItsSheetAndNotBefore)
{
    for (const auto& [end, parameter] : {std::pair(WM_COMMAND, IDCANCEL), {PSM_PRESSBUTTON, PSBTN_OK}}) {
        const HWND sheet = openSheet(), page = PropSheet_GetCurrentPageHwnd(sheet);
        EXPECT_EQ(ListView_GetItemCount(GetDlgItem(page, TAVI_VERSIONS_LIST)), 1);
        MSG message;
        SendMessageW(page, WM_CLOSE, 0, 0);
        EXPECT_FALSE(PeekMessageW(&message, page, WM_COMMAND, WM_COMMAND, PM_REMOVE)) << "it is no Cancel";
        PostMessageW(end == WM_COMMAND ? page : sheet, UINT(end), WPARAM(parameter), 0);
        EXPECT_TRUE(waitUntil([&] {
            EXPECT_TRUE(IsWindow(page));
            if (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE))
                DispatchMessageW(&message);
            return !PropSheet_GetCurrentPageHwnd(sheet);
        })) << "the sheet ends";
        EXPECT_EQ(moduleRefCount(), 1);
        DestroyWindow(sheet);
        EXPECT_EQ(moduleRefCount(), 0) << end;
    }
}

TEST_F(PropertyPageTest, CountsUntilItsLastFrameHasReturned)
{
    const HWND owner = CreateWindowW(L"STATIC", L"", WS_POPUP, 0, 0, 9, 9, nullptr, nullptr, nullptr, nullptr);
    const HWND page = PropSheet_GetCurrentPageHwnd(openSheet(owner));
    std::thread host([&, thread = GetCurrentThreadId()] {
        const HWND first = waitDialog(L"Tavi Remote Backup");
        EXPECT_TRUE(SendMessageTimeoutW(page, WM_COMMAND, TAVI_VERSIONS_RESTORE, 0, 0, 60000, nullptr)); // no other box
        click(first, IDCANCEL);
        waitDialog(L"Tavi Remote Backup", first);
        SendMessageW(owner, WM_CLOSE, 0, 0); // destroys the sheet
        EXPECT_EQ(moduleRefCount(), 1) << "the frames of the question";
        PostThreadMessageW(thread, WM_NULL, 0, 0); // wakes the question's message loop
    });
    SendMessageW(page, WM_COMMAND, TAVI_VERSIONS_RESTORE, 0);
    MSG message;
    EXPECT_FALSE(PeekMessageW(&message, GetParent(page), PSM_PRESSBUTTON, PSM_PRESSBUTTON, PM_REMOVE)) << "no Cancel";
    SendMessageW(page, WM_COMMAND, TAVI_VERSIONS_RESTORE, 0);
    host.join();
    EXPECT_FALSE(IsWindow(page));
    EXPECT_EQ(moduleRefCount(), 0);
}

} // namespace
