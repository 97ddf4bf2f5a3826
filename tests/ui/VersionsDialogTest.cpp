#include "ui/VersionsDialog.h"

#include <commctrl.h>
#include <dlgs.h>
#include <shlobj.h>

#include "statedb/Database.h"
#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Dialogs.h"
#include "ui/resource.h"
#include "ui/RestoreProgressWindow.h"

namespace tavi {
namespace {

using namespace test;

struct VersionsDialogTest : UiTest {
    void open(const PathSet& paths, bool isFolder, const wxString& files)
    {
        const Coverage versions = paths.size() == 1 ? Coverage::all : Coverage::some;
        EXPECT_TRUE(startVersionsDialog({paths, Coverage::none, versions, isFolder, {}},
                                        Manifest::parse(L"FILES\n" + files), nullptr));
        dialog = waitDialog(L"Restore Files");
        list = GetDlgItem(dialog, TAVI_VERSIONS_LIST);
    }
    int enabledActions() const
    {
        return IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_RESTORE)) +
               IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_COPY_TO));
    }
    // Returns whether the dialog has opened the progress window before it closed, and closes that, too.
    bool closesForARestore() const
    {
        EXPECT_TRUE(waitUntil([&] { return !IsWindow(dialog); }));
        const auto progress = RestoreProgressWindow::current();
        if (progress && waitUntil([&] { return progress->dialog() != nullptr; }))
            PostMessageW(progress->dialog(), WM_CLOSE, 0, 0);
        waitForThreads();
        return progress != nullptr;
    }
    HWND dialog = nullptr, list = nullptr;
};

const wchar_t* const kVersions =
    L"C:\\d\\50% & more.txt\n1700000000:1600000000:1:10:0::0:0\n1700000000:1:1:11:0::0:0\n1700100000:1:1:-1:0::0:0\n"
    L"1700200000:1600000002:1:2048:0::0:0\n4102444800:4102444860:1:1048577:0::0:0\n\n"
    L"C:\\d\\ends.txt\n1700000000:1600000000:1:10:0::0:0\n1700000001:5:5:-1:0::0:0\n\n"
    L"simple.map\n1700000000:1:1:1:0::0:0\n1700200000:1:1:1:0::0:0";

TEST_F(VersionsDialogTest, ListsTheVersionsOfTheSelection)
{
    _putenv("TZ=UTC0");
    // A line for each row; the selected row begins with a star.
    const std::wstring ends = L"\n11/14/2023 10:13 PM|09/13/2020 12:26 PM|10 bytes|",
                       runs = L"\n11/14/2023 10:13 PM|\n*11/17/2023 05:46 AM|",
                       all = ends + L"\n11/17/2023 05:46 AM|09/13/2020 12:26 PM|2.0 KB|"
                                    L"\n*01/01/2100 12:00 AM|01/01/2100 12:01 AM|1.0 MB|";
    const std::tuple<PathSet, bool, std::wstring, std::wstring, std::wstring> cases[] = {
        {{L"C:\\d\\50% & more.txt"}, false, L"50% & more.txt are", L"File &Versions:", all},
        {{L"C:\\d\\ends.txt"}, false, L"ends.txt are", L"File &Versions:", ends},
        {{L"C:\\d"}, true, L"the items you selected are", L"Available &Versions:", runs},
        {{L"C:\\a", L"C:\\b"}, true, L"some of the items you selected are", L"Available &Versions:", runs},
    };
    for (const auto& [paths, isFolder, message, label, expected] : cases) {
        open(paths, isFolder, kVersions);
        EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_MESSAGE).find(L"The following versions of " + message), 0u);
        EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_LABEL), label);
        std::wstring rows;
        for (int row = 0; row < ListView_GetItemCount(list); ++row) {
            rows += ListView_GetItemState(list, row, LVIS_SELECTED) ? L"\n*" : L"\n";
            for (int column = 0; column < Header_GetItemCount(ListView_GetHeader(list)); ++column) {
                wchar_t text[100] = L"";
                ListView_GetItemText(list, row, column, text, 100);
                rows += text + std::wstring(L"|");
            }
        }
        EXPECT_EQ(rows, expected);
        const bool isRestorable = rows.find(L'*') != std::wstring::npos;
        EXPECT_EQ(enabledActions(), isRestorable ? 2 : 0);
        PostMessageW(list, WM_KEYDOWN, isRestorable ? VK_RETURN : VK_ESCAPE, 0);
        if (isRestorable)
            click(waitDialog(L"Tavi Remote Backup"), IDCANCEL);
        waitForThreads();
    }
}

TEST_F(VersionsDialogTest, EnablesItsButtonsForASelectedRowAndShortensALongName)
{
    translate("&Restore", "&Zurueck");
    const wxString name = L"C:\\d\\begin" + wxString(L'x', 200) + L"end.txt";
    open({name}, false, name + L"\n5:5:5:5:0::0:0\n6:5:5:5:0::0:0");
    EXPECT_EQ(ListView_GetNextItem(list, -1, LVNI_FOCUSED), 1);
    ListView_SetItemState(list, 1, 0, LVIS_SELECTED);
    EXPECT_EQ(enabledActions(), 0);
    ListView_SetItemState(list, 0, LVIS_SELECTED, LVIS_SELECTED);
    EXPECT_EQ(enabledActions(), 2);
    SIZE ideal{};
    EXPECT_TRUE(SendMessageW(GetDlgItem(dialog, IDCANCEL), BCM_GETIDEALSIZE, 0, reinterpret_cast<LPARAM>(&ideal)))
        << "a button of version 6 of the controls";
    EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_RESTORE), L"&Zurueck");
    const std::wstring message = controlText(dialog, TAVI_VERSIONS_MESSAGE);
    EXPECT_LT(message.find(L"beginxx"), message.find(L"xend.txt are backed up")) << message;
    EXPECT_LT(message.length(), 250u);
    click(dialog, IDCANCEL);
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

// Returns the requested files as source, time, attributes, target and whether it may be overwritten, and deletes them.
std::string takeRequest(DbConnection& database)
{
    DbQuery stored = database.execQuery("SELECT ifnull(group_concat(manifest_path || ' ' || timestamp || ' ' || "
                                        "attributes || ' ' || target_path || ' ' || overwrite, ';'), '') "
                                        "FROM restore_files");
    const char* text = "";
    EXPECT_TRUE(stored.nextRow());
    stored.fieldText(0, text);
    const std::string files = text;
    EXPECT_EQ(database.execDML("DELETE FROM restores"), files.empty() ? 0 : 1);
    database.execDML("DELETE FROM restore_files");
    return files;
}

TEST_F(VersionsDialogTest, RequestsWhatTheAnswersSay)
{
    // In folder "f" there is a file, and it and one deeper are backed up. Folder "t" is for the targets.
    for (const wchar_t* name : {L"f", L"t"})
        CreateDirectoryW(in(name).wc_str(), nullptr);
    for (const wchar_t* name : {L"f\\5%", L"t\\was"})
        std::ofstream(in(name).wc_str());
    DbConnection database;
    database.open(service.file(L"tavistate.dat"));
    database.execDML("CREATE TABLE restores(request_time, machine_id, machine_alias, encryption_key);"
                     "CREATE TABLE restore_files(restore_id, manifest_path, file_size, timestamp, ctime, attributes,"
                     "target_path, overwrite)");
    const wxString files = in(L"f\\5%\n100:1:7:1:0::0:40\n200:1:8:2:0::0:41\n\n") +
                           in(L"f\\b\\c\n100:1:7:3:0::0:0\n\n") + L"simple.map\n100:1:1:1:0::0:0";
    const PathSet one = {in(L"f\\5%")}, whole = {in(L"f")}, several = {in(L"f\\5%"), in(L"f\\b")};
    constexpr int kRestore = TAVI_VERSIONS_RESTORE, kCopy = TAVI_VERSIONS_COPY_TO, kCloseWindow = 0;
    const wchar_t* const loses = L"Restoring this file will overwrite your current version, and you will lose any ";
    const wchar_t* const loseAll = L"since they were last backed up.  Would you like to overwrite it?";
    const wchar_t* const exist = L"One or more of the items you selected already exist.  Would you like to overwrite ";
    // The selection, the row, the button, the answer to each box, the question of the last box, the request. A chosen
    // folder ends in a backslash, and the rest of a path below it begins with one.
    const std::tuple<const PathSet&, int, int, std::vector<int>, const wchar_t*, const wchar_t*> cases[] = {
        {one, 0, kRestore, {IDYES}, loses, LR"(f\5% 100 32 f\5% 1)"},
        {one, 1, kRestore, {IDNO}, loses, LR"(f\5% 200 33 f\5% (1) 0)"},
        {one, 1, kRestore, {kCloseWindow}, loses, L""},
        {whole, 0, kRestore, {IDYES}, loseAll, LR"(f\5% 100 32 f\5% 1;f\b\c 100 0 f\b\c 1)"},
        // The save box itself asks about an existing file.
        {one, 1, kCopy, {IDOK, IDYES}, L"", LR"(f\5% 200 33 t\was 1)"},
        {one, 1, kCopy, {IDCANCEL}, L"", L""},
        {several, 0, kCopy, {IDOK}, L"", LR"(f\5% 100 32 t\\5% 0;f\b\c 100 0 t\\b\c 0)"},
        {several, 0, kCopy, {IDOK, IDYES}, exist, LR"(f\5% 100 32 t\\5% 1;f\b\c 100 0 t\\b\c 1)"},
        {several, 0, kCopy, {IDOK, IDNO}, exist, LR"(f\5% 100 32 t\\5% (1) 0;f\b\c 100 0 t\\b\c 0)"},
        {several, 0, kCopy, {IDOK, IDCANCEL}, exist, L""},
        // The target of a single folder is the chosen folder, which always exists.
        {whole, 0, kCopy, {IDOK, IDYES}, exist, LR"(f\5% 100 32 t\\5% 1;f\b\c 100 0 t\\b\c 1)"},
    };
    for (const auto& [paths, row, button, answers, question, request] : cases) {
        SCOPED_TRACE(request);
        DeleteFileW(in(L"t\\5%").wc_str());
        if (answers.size() > 1)
            std::ofstream(in(L"t\\5%").wc_str());
        open(paths, paths != one, files);
        ListView_SetItemState(list, row, LVIS_SELECTED, LVIS_SELECTED);
        click(dialog, button);
        HWND box = nullptr;
        for (const int answer : answers) {
            box = waitDialog(nullptr, {dialog, box});
            if (GetDlgItem(box, cmb13)) {
                EXPECT_EQ(controlText(box, cmb13), L"5%");
                SetDlgItemTextW(box, cmb13, in(L"t\\was").wc_str());
            }
            chooseFolder(box, in(L"t"));
            EXPECT_TRUE(answer == IDOK || controlText(box, 0xFFFF).find(question) != std::wstring::npos);
            answer == kCloseWindow ? PostMessageW(dialog, WM_CLOSE, 0, 0) : click(box, answer);
        }
        EXPECT_EQ(closesForARestore(), *request != 0);
        wxString requested = fromUtf8(takeRequest(database));
        requested.Replace(in(L""), L"");
        EXPECT_EQ(requested, request);
    }
}

} // namespace
} // namespace tavi
