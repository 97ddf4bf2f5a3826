#include "ui/ContextMenu.h"

#include <vector>

#include <malloc.h>

#include <gtest/gtest.h>

#include "backupset/CurrentManifest.h"
#include "core/Module.h"
#include "tests/support/Catalogue.h"
#include "tests/support/Dialogs.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"
#include "ui/MenuBitmap.h"

namespace tavi {
namespace {

constexpr UINT kFirstId = 0x7001;

Selection selectionOf(const wchar_t* name, bool isFolder, int restoreMode = 1)
{
    Selection selection;
    selection.displayName = name;
    selection.isFolder = isFolder;
    selection.restoreMode = restoreMode;
    return selection;
}

class ContextMenuTest : public testing::Test {
  protected:
    ContextMenuTest() : menu_(CreatePopupMenu())
    {
        setModuleInstance(GetModuleHandleW(nullptr));
        AppendMenuW(menu_, MF_STRING, 1, L"Open");
        AppendMenuW(menu_, MF_STRING, 2, L"Cut");
    }
    ~ContextMenuTest() override
    {
        DestroyMenu(menu_);
        freeMenuBitmaps();
        requestWatcherStop();
    }
    // One item each: its text, "-" for a separator.
    std::vector<std::wstring> items() const
    {
        std::vector<std::wstring> result;
        for (int i = 0; i < GetMenuItemCount(menu_); ++i) {
            wchar_t text[200] = L"";
            GetMenuStringW(menu_, static_cast<UINT>(i), text, 200, MF_BYPOSITION);
            result.push_back(GetMenuState(menu_, static_cast<UINT>(i), MF_BYPOSITION) & MF_SEPARATOR ? L"-" : text);
        }
        return result;
    }

    test::LogCapture log_;
    test::InstalledService service_;
    HMENU menu_;
};

TEST_F(ContextMenuTest, InsertsTheCommandThatFits)
{
    const struct {
        Selection selection;
        UINT flags, lastId;
        const wchar_t* label; // null: a lone separator; empty: nothing at all
    } cases[] = {
        {selectionOf(L"a.txt", false), CMF_NORMAL, 0x7FFF, L"Restore Previous Version"},
        {selectionOf(L"a & 100%s", true), CMF_EXPLORE, kFirstId, L"Restore Files in Folder"},
        {selectionOf(L"", false, -1), CMF_NORMAL, 0x7FFF, L"Restore Previous Versions"},
        {selectionOf(L"", true, -1), CMF_CANRENAME | 0x100, 0x7FFF, L"Restore Files"},
        {selectionOf(L"a.txt", false, 0), CMF_NORMAL, 0x7FFF, nullptr},
        {selectionOf(L"a.txt", false), CMF_NORMAL, kFirstId - 1, nullptr},
        {selectionOf(L"a.txt", false), CMF_DEFAULTONLY, 0x7FFF, L""},
        {selectionOf(L"a.txt", false), CMF_NOVERBS | CMF_EXPLORE, 0x7FFF, L""},
    };
    for (const auto& test : cases) {
        std::vector<std::wstring> expected = {L"Open", L"Cut"};
        const bool command = test.label && *test.label;
        if (!test.label || command)
            expected.insert(expected.begin() + 1, L"-");
        if (command)
            expected.insert(expected.begin() + 2, test.label);
        EXPECT_EQ(insertMenuItems(menu_, 1, kFirstId, test.lastId, test.flags, test.selection), command ? 1u : 0u);
        EXPECT_EQ(items(), expected);
        if (command) {
            MENUITEMINFOW item{};
            item.cbSize = sizeof(item);
            item.fMask = MIIM_ID | MIIM_CHECKMARKS;
            EXPECT_TRUE(GetMenuItemInfoW(menu_, 2, TRUE, &item));
            EXPECT_EQ(item.wID, kFirstId);
            EXPECT_TRUE(item.hbmpChecked && item.hbmpChecked == item.hbmpUnchecked);
        }
        while (GetMenuItemCount(menu_) > 2)
            DeleteMenu(menu_, 1, MF_BYPOSITION);
    }
}

TEST_F(ContextMenuTest, KeepsAReferenceToTheManifest)
{
    // A well-meant release would free a manifest that a menu has seen.
    const auto isAllocated = [](const void* block) {
        return HeapValidate(reinterpret_cast<HANDLE>(_get_heap_handle()), 0, block) != FALSE;
    };
    // A fresh one: earlier menus hold theirs.
    StopManifestWatcher();
    const Manifest* manifest = nullptr;
    ASSERT_TRUE(test::waitUntil([&] { return (manifest = GetCurrentManifest()) != nullptr; }));
    insertMenuItems(menu_, 0, kFirstId, 0x7FFF, CMF_DEFAULTONLY, Selection());
    StopManifestWatcher();
    manifest->Release();
    EXPECT_TRUE(isAllocated(manifest));
    manifest->Release();
    EXPECT_FALSE(isAllocated(manifest));
}

TEST_F(ContextMenuTest, AnswersVerbsAndHelp)
{
    const Selection one = selectionOf(L"50%s & more.txt", false), folder = selectionOf(L"caf\u00e9", true),
                    several = selectionOf(L"", true);
    constexpr HRESULT cut = static_cast<HRESULT>(0x8007007A);
    const struct {
        UINT offset, type;
        const Selection& selection;
        UINT size;
        HRESULT result;
        const wchar_t* text;
    } cases[] = {
        {0, GCS_VERBW, one, 100, S_OK, L"TaviRestore"},
        {1, GCS_VERBW, several, 100, S_OK, L"TaviBackup"},
        {2, GCS_VERBA, several, 15, S_OK, L"TaviDontBackup"},
        {2, GCS_VERBA, several, 14, cut, L"TaviDontBacku"},
        {0, GCS_VERBW, one, 11, cut, L"TaviRestor"},
        {0, GCS_VERBW, one, 1, cut, L""},
        {0, GCS_VERBW, one, 0, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, one, 0x80000000, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, one, 100, S_OK, L"Restore an older version of 50%s & more.txt from the Tavi servers."},
        {0, GCS_HELPTEXTW, folder, 100, S_OK, L"Restore files in caf\u00e9 from the Tavi servers."},
        {0, GCS_HELPTEXTA, folder, 100, S_OK, L"Restore files in caf\u00e9 from the Tavi servers."},
        {0, GCS_HELPTEXTA, folder, 22, cut, L"Restore files in caf\u00e9"},
        {0, GCS_HELPTEXTW, several, 100, S_OK, L"Restore older versions of the selected files."},
        {1, GCS_HELPTEXTW, folder, 100, S_OK, L"Marks caf\u00e9 to be backed up with Tavi Remote Backup."},
        {1, GCS_HELPTEXTA, several, 100, S_OK, L"Marks the selected items to be backed up with Tavi Remote Backup."},
        {2, GCS_HELPTEXTW, one, 100, S_OK, L"Removes 50%s & more.txt from the Tavi Remote Backup configuration."},
        {2, GCS_HELPTEXTW, several, 100, S_OK,
         L"Removes the selected items from the Tavi Remote Backup configuration."},
        {1, GCS_VALIDATEW, one, 100, S_OK, L"?"},
        {1, GCS_VERBW + 0x10, one, 100, S_OK, L"?"},
        {3, GCS_VERBW, one, 100, E_INVALIDARG, L"?"},
        {0xFFFFFFFF, GCS_VALIDATEW, one, 100, E_INVALIDARG, L"?"},
    };
    for (const auto& test : cases) {
        const bool wide = test.type & GCS_UNICODE;
        wchar_t buffer[120] = L"?";
        char narrow[120] = "?";
        EXPECT_EQ(commandString(test.offset, test.type, wide ? reinterpret_cast<LPSTR>(buffer) : narrow, test.size,
                                test.selection),
                  test.result)
            << test.text;
        if (!wide)
            MultiByteToWideChar(CP_ACP, 0, narrow, -1, buffer, 120);
        EXPECT_EQ(std::wstring(buffer), test.text);
    }
    EXPECT_EQ(commandString(0, GCS_VERBW, nullptr, 10, one), E_INVALIDARG);
}

TEST_F(ContextMenuTest, SpeaksTheCataloguesLanguage)
{
    const test::Catalogue catalogue(
        {{"Restore Files in Folder", "Dateien im Ordner wiederherstellen"},
         {"Restore files in %s from the Tavi servers.", "Aus %s (100 %) wiederherstellen: %s"}});
    EXPECT_EQ(insertMenuItems(menu_, 0, kFirstId, 0x7FFF, 0, selectionOf(L"x%n", true)), 1u);
    EXPECT_EQ(items()[1], L"Dateien im Ordner wiederherstellen");
    wchar_t buffer[120];
    EXPECT_EQ(commandString(0, GCS_HELPTEXTW, reinterpret_cast<LPSTR>(buffer), 120, selectionOf(L"x%n", true)), S_OK);
    EXPECT_EQ(std::wstring(buffer), L"Aus x%n (100 %) wiederherstellen: %s");
}

TEST_F(ContextMenuTest, InvokesByOffsetOnly)
{
    CMINVOKECOMMANDINFO info{};
    info.cbSize = sizeof(info);
    const struct {
        LPCSTR verb;
        HRESULT result;
    } cases[] = {{"TaviRestore", E_INVALIDARG},
                 {MAKEINTRESOURCEA(1), S_OK},
                 {MAKEINTRESOURCEA(2), S_OK},
                 {MAKEINTRESOURCEA(3), E_INVALIDARG},
                 {MAKEINTRESOURCEA(0xFFFF), E_INVALIDARG}};
    for (const auto& test : cases) {
        info.lpVerb = test.verb;
        EXPECT_EQ(invokeCommand(info, selectionOf(L"a", false)), test.result);
    }
    EXPECT_EQ(test::findDialog(L"Restore Files"), nullptr);

    // With a manifest, offset 0 opens the window.
    const Manifest* manifest = nullptr;
    ASSERT_TRUE(test::waitUntil([&] { return (manifest = GetCurrentManifest()) != nullptr; }));
    manifest->Release();
    info.lpVerb = MAKEINTRESOURCEA(0);
    EXPECT_EQ(invokeCommand(info, selectionOf(L"a", false)), S_OK);
    const HWND dialog = test::waitDialog(L"Restore Files");
    ASSERT_TRUE(dialog);
    PostMessageW(dialog, WM_CLOSE, 0, 0);
    EXPECT_TRUE(test::waitUntil([] { return moduleRefCount() == 0; }));
}

} // namespace
} // namespace tavi
