#include "ui/VersionsDialog.h"

#include <atomic>
#include <cstdlib>
#include <fstream>
#include <vector>

#include <commctrl.h>
#include <shlobj.h>

#include <gtest/gtest.h>
#include <sqlite3.h>

#include "core/Module.h"
#include "core/Text.h"
#include "tests/support/Catalogue.h"
#include "tests/support/Dialogs.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"
#include "ui/CopyTarget.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using test::click;
using test::controlText;
using test::waitDialog;
using test::waitGone;
using test::waitUntil;

constexpr const wchar_t* kTitle = L"Restore Files";
constexpr const wchar_t* kQuestion = L"Tavi Remote Backup";
constexpr int kMessageText = 0xFFFF;
using Table = std::vector<std::vector<std::wstring>>;

std::atomic<int> progressWindows{0};

Selection selectionOf(const std::vector<std::wstring>& paths, bool isFolder = false, int coverage = 1)
{
    Selection selection;
    selection.paths.insert(paths.begin(), paths.end());
    selection.isFolder = isFolder;
    selection.restoreMode = coverage;
    return selection;
}

HWND listOf(HWND dialog)
{
    return GetDlgItem(dialog, TAVI_VERSIONS_LIST);
}

// The list's texts; the selected row begins with a star.
Table rowsOf(HWND dialog)
{
    const HWND list = listOf(dialog);
    const int columns = Header_GetItemCount(ListView_GetHeader(list));
    Table rows(static_cast<std::size_t>(ListView_GetItemCount(list)));
    for (int row = 0; row < ListView_GetItemCount(list); ++row) {
        auto& texts = rows[static_cast<std::size_t>(row)];
        for (int column = 0; column < columns; ++column) {
            wchar_t text[100] = L"";
            ListView_GetItemText(list, row, column, text, 100);
            texts.push_back(text);
        }
        if (ListView_GetItemState(list, row, LVIS_SELECTED))
            texts[0].insert(0, L"*");
    }
    return rows;
}

bool actionsEnabled(HWND dialog)
{
    const bool restore = IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_RESTORE));
    EXPECT_EQ(restore, IsWindowEnabled(GetDlgItem(dialog, TAVI_VERSIONS_COPY_TO)));
    return restore;
}

class VersionsDialogTest : public testing::Test {
  protected:
    VersionsDialogTest()
    {
        _putenv("TZ=UTC0");
        setModuleInstance(GetModuleHandleW(nullptr));
        progressWindows = 0;
        setProgressWindowOpener([] { ++progressWindows; });
        sqlite3_open(toUtf8(service_.file(L"tavistate.dat")).c_str(), &database_);
        run("CREATE TABLE restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT, encryption_key TEXT);"
            "CREATE TABLE restore_files(restore_id INTEGER, manifest_path TEXT, file_size INTEGER, timestamp INTEGER,"
            "ctime INTEGER, attributes INTEGER, target_path TEXT, overwrite INTEGER)");
    }
    ~VersionsDialogTest() override
    {
        waitForThreads();
        setProgressWindowOpener(nullptr);
        sqlite3_close(database_);
    }
    void waitForThreads(int left = 0)
    {
        EXPECT_TRUE(waitUntil([&] { return moduleRefCount() == left; }));
    }
    HWND open(const Selection& selection, const std::wstring& files, const wchar_t* title = kTitle,
              HWND other = nullptr)
    {
        Manifest* const manifest = Manifest::Parse(wxString(L"FILES\n" + files));
        manifest->AddRef();
        EXPECT_TRUE(startVersionsDialog(selection, ManifestRef(manifest), nullptr));
        const HWND dialog = waitDialog(title, other);
        EXPECT_TRUE(dialog);
        return dialog;
    }
    void close(HWND dialog)
    {
        click(dialog, IDCANCEL);
        EXPECT_TRUE(waitGone(dialog));
    }
    void answer(int button, const std::wstring& text)
    {
        const HWND question = waitDialog(kQuestion);
        EXPECT_NE(controlText(question, kMessageText).find(text), std::wstring::npos);
        click(question, button);
    }
    void run(const char* sql)
    {
        EXPECT_EQ(sqlite3_exec(database_, sql, nullptr, nullptr, nullptr), SQLITE_OK);
    }
    // Checks the request that was written, and forgets it.
    void expectRequest(const Table& files, bool written)
    {
        waitForThreads();
        Table rows;
        const auto collect = [](void* out, int count, char** values, char**) {
            auto& row = static_cast<Table*>(out)->emplace_back();
            for (int i = 0; i < count; ++i)
                row.push_back(fromUtf8(values[i]).ToStdWstring());
            return 0;
        };
        sqlite3_exec(
            database_,
            "SELECT target_path, overwrite, manifest_path, timestamp, attributes FROM restore_files ORDER BY 1",
            collect, &rows, nullptr);
        EXPECT_EQ(rows, files);
        rows.clear();
        sqlite3_exec(database_, "SELECT machine_id FROM restores", collect, &rows, nullptr);
        EXPECT_EQ(rows.size(), written ? 1u : 0u);
        EXPECT_EQ(progressWindows.exchange(0), written);
        run("DELETE FROM restores; DELETE FROM restore_files");
    }

    test::LogCapture log_;
    test::InstalledService service_;
    test::TemporaryFolder folder_;
    sqlite3* database_ = nullptr;
};

const wchar_t* const kVersions = L"C:\\d\\50% & more.txt\n1700000000:1600000000:1:10:0::0:0\n1700000000:1:1:11:0::0:0\n"
                                 L"1700100000:1:1:-1:0::0:0\n1700200000:1600000002:1:2048:0::0:0\n"
                                 L"4102444800:4102444860:1:1048577:0::0:0\n\n"
                                 L"C:\\d\\deleted.txt\n5:5:5:-1:0::0:0\n\n"
                                 L"C:\\d\\ends.txt\n1700000000:1600000000:1:10:0::0:0\n1700000001:5:5:-1:0::0:0\n\n"
                                 L"simple.map\n1700000000:1:1:1:0::0:0\n1700200000:1:1:1:0::0:0";

TEST_F(VersionsDialogTest, ListsTheVersionsOfTheSelection)
{
    const Table runs = {{L"11/14/2023 10:13 PM"}, {L"*11/17/2023 05:46 AM"}};
    const Table ends = {{L"11/14/2023 10:13 PM", L"09/13/2020 12:26 PM", L"10 bytes"}};
    const wchar_t* const all =
        L"the items you selected are backed up on the Tavi servers.  You can select one and restore the files";
    const wchar_t* const some =
        L"some of the items you selected are backed up on the Tavi servers.  You can select one and restore "
        L"the available files";
    const struct {
        Selection selection;
        const wchar_t *message, *label;
        Table rows;
    } cases[] = {
        {selectionOf({L"C:\\d\\50% & more.txt"}),
         L"50% & more.txt are backed up on the Tavi servers.  You can select one and restore it",
         L"File &Versions:",
         {ends[0],
          {L"11/17/2023 05:46 AM", L"09/13/2020 12:26 PM", L"2.0 KB"},
          {L"*01/01/2100 12:00 AM", L"01/01/2100 12:01 AM", L"1.0 MB"}}},
        {selectionOf({L"C:\\d\\deleted.txt"}), L"deleted.txt are", L"File &Versions:", {}},
        {selectionOf({L"C:\\d\\ends.txt"}), L"ends.txt are", L"File &Versions:", ends},
        {selectionOf({L"C:\\d"}, true), all, L"Available &Versions:", runs},
        {selectionOf({L"C:\\a", L"C:\\b"}), all, L"Available &Versions:", runs},
        {selectionOf({L"C:\\a", L"C:\\b"}, true, -1), some, L"Available &Versions:", runs},
        {selectionOf({}, false, 0), some, L"Available &Versions:", runs},
    };
    for (const auto& test : cases) {
        const HWND dialog = open(test.selection, kVersions);
        EXPECT_EQ(
            controlText(dialog, TAVI_VERSIONS_MESSAGE).find(L"The following versions of " + std::wstring(test.message)),
            0u);
        EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_LABEL), test.label);
        EXPECT_EQ(rowsOf(dialog), test.rows);
        EXPECT_EQ(actionsEnabled(dialog), !test.rows.empty() && test.rows.back()[0][0] == L'*');
        EXPECT_FALSE(IsWindowVisible(GetDlgItem(dialog, TAVI_VERSIONS_VIEW)));
        close(dialog);
    }
}

TEST_F(VersionsDialogTest, IsReadyForTheKeyboard)
{
    HWND dialog = open(selectionOf({L"C:\\d\\50% & more.txt"}), kVersions);
    const HWND list = listOf(dialog);
    GUITHREADINFO gui{};
    gui.cbSize = sizeof(gui);
    GetGUIThreadInfo(GetWindowThreadProcessId(dialog, nullptr), &gui);
    EXPECT_EQ(gui.hwndFocus, list);
    EXPECT_EQ(ListView_GetNextItem(list, -1, LVNI_FOCUSED), 2);
    EXPECT_EQ(ListView_GetExtendedListViewStyle(list), DWORD{LVS_EX_FULLROWSELECT | LVS_EX_DOUBLEBUFFER});
    EXPECT_EQ(ListView_GetColumnWidth(list, 0), 125);
    EXPECT_EQ(ListView_GetColumnWidth(list, 2), 75);
    EXPECT_TRUE(SendMessageW(dialog, WM_GETICON, ICON_SMALL, 0) && SendMessageW(dialog, WM_GETICON, ICON_BIG, 0));
    // The buttons follow the row that changed last.
    ListView_SetItemState(list, 2, 0, LVIS_SELECTED);
    EXPECT_FALSE(actionsEnabled(dialog));
    ListView_SetItemState(list, 0, LVIS_SELECTED, LVIS_SELECTED);
    EXPECT_TRUE(actionsEnabled(dialog));

    // Version 6 of the controls, whatever the host has: only its buttons know their ideal size.
    SIZE ideal{};
    EXPECT_TRUE(SendMessageW(GetDlgItem(dialog, IDCANCEL), BCM_GETIDEALSIZE, 0, reinterpret_cast<LPARAM>(&ideal)));

    PostMessageW(list, WM_KEYDOWN, VK_RETURN, 0);
    answer(IDCANCEL, L"Restoring this file will");
    EXPECT_TRUE(waitGone(dialog));
    dialog = open(selectionOf({L"C:\\d\\deleted.txt"}), kVersions);
    PostMessageW(listOf(dialog), WM_KEYDOWN, VK_RETURN, 0);
    PostMessageW(listOf(dialog), WM_KEYDOWN, VK_ESCAPE, 0);
    EXPECT_TRUE(waitGone(dialog));
}

TEST_F(VersionsDialogTest, RestoresInPlaceAsAnswered)
{
    const std::wstring file = folder_.path() + L"\\here.txt", below = folder_.path() + L"\\sub\\x.txt";
    std::ofstream{file.c_str()};
    const std::wstring files = file + L"\n100:1:7:1:0::0:40\n200:1:8:2:0::0:41\n\n" + below +
                               L"\n100:1:7:3:0::0:0\n\nsimple.map\n100:1:1:1:0::0:0";
    const wchar_t* const one =
        L"Restoring this file will overwrite your current version, and you will lose any changes\r\nthat";
    const wchar_t* const several = L"since they were last backed up.  Would you like to overwrite it?";
    const struct {
        Selection selection;
        int row, answer;
        const wchar_t* question;
        Table files;
    } cases[] = {
        {selectionOf({file}), 1, IDYES, one, {{file, L"1", file, L"200", L"33"}}},
        {selectionOf({file}), 0, IDYES, one, {{file, L"1", file, L"100", L"32"}}},
        {selectionOf({file}), 1, IDNO, one, {{folder_.path() + L"\\here (1).txt", L"0", file, L"200", L"33"}}},
        {selectionOf({file}), 1, IDCANCEL, one, {}},
        {selectionOf({folder_.path()}, true),
         0,
         IDYES,
         several,
         {{file, L"1", file, L"100", L"32"}, {below, L"1", below, L"100", L"0"}}},
    };
    for (const auto& test : cases) {
        const HWND dialog = open(test.selection, files);
        ListView_SetItemState(listOf(dialog), test.row, LVIS_SELECTED, LVIS_SELECTED);
        click(dialog, TAVI_VERSIONS_RESTORE);
        answer(test.answer, test.question);
        EXPECT_TRUE(waitGone(dialog));
        expectRequest(test.files, !test.files.empty());
    }
    // The window goes while its question is open.
    const HWND dialog = open(cases[0].selection, files);
    click(dialog, TAVI_VERSIONS_RESTORE);
    EXPECT_TRUE(waitDialog(kQuestion));
    PostMessageW(dialog, WM_CLOSE, 0, 0);
    EXPECT_TRUE(waitGone(dialog));
    expectRequest({}, false);
}

HWND visibleEdit(HWND box)
{
    HWND edit = nullptr;
    for (HWND child = nullptr; (child = FindWindowExW(box, child, nullptr, nullptr)) != nullptr && !edit;) {
        wchar_t name[20];
        GetClassNameW(child, name, 20);
        edit = lstrcmpiW(name, L"Edit") == 0 && IsWindowVisible(child) ? child : visibleEdit(child);
    }
    return edit;
}

TEST_F(VersionsDialogTest, CopiesOneFileToTheChosenName)
{
    const std::wstring file = folder_.path() + L"\\100% here.txt", target = folder_.path() + L"\\there.txt";
    std::ofstream{target.c_str()};
    for (const bool accept : {false, true}) {
        const HWND dialog = open(selectionOf({file}), file + L"\n100:1:7:1:0::0:0");
        click(dialog, TAVI_VERSIONS_COPY_TO);
        const HWND box = waitDialog(L"Restore File As");
        ASSERT_TRUE(box);
        EXPECT_NE(test::windowText(visibleEdit(box)).find(L"100% here.txt"), std::wstring::npos);
        SendMessageW(visibleEdit(box), WM_SETTEXT, 0, reinterpret_cast<LPARAM>(target.c_str()));
        click(box, accept ? IDOK : IDCANCEL);
        // The box itself asks about the file that is there.
        if (accept)
            click(waitDialog(L"Restore File As", box), IDYES);
        EXPECT_TRUE(waitGone(dialog));
        expectRequest(accept ? Table{{target, L"1", file, L"100", L"0"}} : Table(), accept);
    }
}

TEST_F(VersionsDialogTest, CopiesSeveralBehindTheChosenFolder)
{
    const std::wstring from = folder_.path() + L"\\from", to = folder_.path() + L"\\to", a = from + L"\\a.txt",
                       c = from + L"\\b\\c.txt", blocker = to + L"\\a.txt";
    CreateDirectoryW(to.c_str(), nullptr);
    const std::wstring files =
        a + L"\n100:1:7:1:0::0:0\n\n" + c + L"\n100:1:7:1:0::0:0\n\nsimple.map\n100:1:1:1:0::0:0";
    // The folder ends in a backslash and the rest begins with one.
    const auto copied = [&](const wchar_t* first, const wchar_t* overwrite) {
        return Table{{to + L"\\\\" + first, overwrite, a, L"100", L"0"},
                     {to + L"\\\\b\\c.txt", overwrite, c, L"100", L"0"}};
    };
    const auto several = selectionOf({a, from + L"\\b"}, true);
    constexpr int kNotAsked = 0, kBrowserCancelled = -1;
    const struct {
        Selection selection;
        bool targetExists;
        int answer;
        Table files;
    } cases[] = {
        {several, false, kNotAsked, copied(L"a.txt", L"0")},
        {several, true, IDYES, copied(L"a.txt", L"1")},
        {several, true, IDNO, copied(L"a (1).txt", L"0")},
        {several, true, IDCANCEL, {}},
        {several, true, kBrowserCancelled, {}},
        // The target of a single folder is the chosen folder itself, which is always there.
        {selectionOf({from}, true), false, IDYES, copied(L"a.txt", L"1")},
    };
    for (const auto& test : cases) {
        DeleteFileW(blocker.c_str());
        if (test.targetExists)
            std::ofstream{blocker.c_str()};
        const HWND dialog = open(test.selection, files);
        click(dialog, TAVI_VERSIONS_COPY_TO);
        HWND browser = nullptr;
        ASSERT_TRUE(
            waitUntil([&] { return (browser = GetLastActivePopup(dialog)) != dialog && IsWindowVisible(browser); }));
        SendMessageW(browser, BFFM_SETSELECTIONW, TRUE, reinterpret_cast<LPARAM>(to.c_str()));
        click(browser, test.answer == kBrowserCancelled ? IDCANCEL : IDOK);
        if (test.answer > 0)
            answer(test.answer,
                   L"One or more of the items you selected already exist.  Would you like to overwrite those files, "
                   L"restore to a different filename, or cancel?");
        EXPECT_TRUE(waitGone(dialog));
        expectRequest(test.files, !test.files.empty());
    }
}

TEST_F(VersionsDialogTest, ManyVersionsAndSeveralWindows)
{
    std::wstring files = L"C:\\f\n";
    for (int i = 0; i < 5000; ++i)
        files += std::to_wstring(1700000000 + i * 1000) + L":1:1:1:0::0:0\n";
    files += L"\n" + std::wstring(kVersions);
    const DWORD start = GetTickCount();
    const HWND first = open(selectionOf({L"C:\\f"}), files);
    EXPECT_LT(GetTickCount() - start, 3000u);
    EXPECT_EQ(ListView_GetItemCount(listOf(first)), 5000);
    EXPECT_EQ(ListView_GetNextItem(listOf(first), -1, LVNI_SELECTED), 4999);
    EXPECT_TRUE(ListView_IsItemVisible(listOf(first), 4999));
    const HWND second = open(selectionOf({L"C:\\d"}, true), files, kTitle, first);
    EXPECT_EQ(rowsOf(second).size(), 2u);
    EXPECT_EQ(moduleRefCount(), 2);
    close(first);
    waitForThreads(1);
    close(second);
}

TEST_F(VersionsDialogTest, ShortensALongNameAndTranslates)
{
    const test::Catalogue catalogue(
        {{kTitle, L"Dateien"}, {L"&Restore", L"&Zur\u00fcck"}, {L"File &Versions:", L"&Alle:"}});
    const std::wstring name = L"C:\\d\\begin" + std::wstring(200, L'x') + L"end.txt";
    const HWND dialog = open(selectionOf({name}), name + L"\n5:5:5:5:0::0:0", L"Dateien");
    EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_RESTORE), L"&Zur\u00fcck");
    EXPECT_EQ(controlText(dialog, TAVI_VERSIONS_LABEL), L"&Alle:");
    const std::wstring message = controlText(dialog, TAVI_VERSIONS_MESSAGE);
    EXPECT_NE(message.find(L"beginxx"), std::wstring::npos);
    EXPECT_NE(message.find(L"xend.txt are backed up"), std::wstring::npos);
    EXPECT_LT(message.length(), 250u);
    close(dialog);
    waitForThreads();
}

TEST(CopyTarget, FindsTheCommonPrefix)
{
    const std::wstring deep = L"C:\\" + std::wstring(400, L'x');
    const struct {
        PathSet paths;
        std::wstring prefix;
    } cases[] = {
        {{}, L""},
        {{L"C:\\w\\a"}, L"C:\\w\\a"},
        {{L"C:\\w\\bc", L"C:\\w\\bd", L"C:\\w\\sub\\c"}, L"C:\\w"},
        {{L"C:\\w", L"C:\\w\\b"}, L"C:\\w"},
        {{L"C:\\a", L"C:\\b", L"C:\\c\\d"}, L"C:\\"},
        {{L"C:\\", L"C:\\b"}, L"C:\\"},
        {{L"C:\\a", L"D:\\a"}, L""},
        {{L"\\\\s\\t\\a", L"\\\\s\\t\\b"}, L"\\\\s\\t"},
        {{wxString(deep + L"\\a"), wxString(deep + L"\\b")}, deep},
    };
    for (const auto& test : cases)
        EXPECT_EQ(commonPrefix(test.paths).ToStdWstring(), test.prefix);
}

} // namespace
} // namespace tavi
