#include "ui/ContextMenu.h"

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
    return {{}, 0, restoreMode, isFolder, name};
}

struct ContextMenuTest : testing::Test {
    ContextMenuTest()
    {
        setModuleInstance(GetModuleHandleW(nullptr));
        // A fresh manifest: earlier menus hold theirs.
        StopManifestWatcher();
        test::waitUntil([&] { return (manifest = GetCurrentManifest()) != nullptr; });
    }
    ~ContextMenuTest() override
    {
        freeMenuBitmaps();
        requestWatcherStop();
    }

    test::LogCapture log;
    test::InstalledService service;
    const Manifest* manifest = nullptr;
};

TEST_F(ContextMenuTest, InsertsTheCommandThatFits)
{
    const test::Catalogue catalogue(service.file(L""), "Restore Files", "Dateien holen");
    const struct {
        Selection selection;
        UINT flags, lastId;
        std::wstring menu;
    } cases[] = {
        {selectionOf(L"a.txt", false), CMF_NORMAL, 0x7FFF, L"Open|-|Restore Previous Version|Cut|"},
        {selectionOf(L"a & 100%s", true), CMF_EXPLORE, kFirstId, L"Open|-|Restore Files in Folder|Cut|"},
        {selectionOf(L"", false, -1), CMF_NORMAL, 0x7FFF, L"Open|-|Restore Previous Versions|Cut|"},
        {selectionOf(L"", true, -1), CMF_CANRENAME | 0x100, 0x7FFF, L"Open|-|Dateien holen|Cut|"},
        {selectionOf(L"a.txt", false, 0), CMF_NORMAL, 0x7FFF, L"Open|-|Cut|"},
        {selectionOf(L"a.txt", false), CMF_NORMAL, kFirstId - 1, L"Open|-|Cut|"},
        {selectionOf(L"a.txt", false), CMF_DEFAULTONLY, 0x7FFF, L"Open|Cut|"},
        {selectionOf(L"a.txt", false), CMF_NOVERBS | CMF_EXPLORE, 0x7FFF, L"Open|Cut|"},
    };
    for (const auto& test : cases) {
        const HMENU menu = CreatePopupMenu();
        AppendMenuW(menu, MF_STRING, 1, L"Open");
        AppendMenuW(menu, MF_STRING, 2, L"Cut");
        const UINT used = insertMenuItems(menu, 1, kFirstId, test.lastId, test.flags, test.selection);
        std::wstring texts;
        for (UINT i = 0; static_cast<int>(i) < GetMenuItemCount(menu); ++i) {
            wchar_t text[200] = L"";
            GetMenuStringW(menu, i, text, 200, MF_BYPOSITION);
            texts += GetMenuState(menu, i, MF_BYPOSITION) & MF_SEPARATOR ? L"-|" : text + std::wstring(L"|");
        }
        EXPECT_EQ(texts, test.menu);
        MENUITEMINFOW item{};
        item.cbSize = sizeof(item);
        item.fMask = MIIM_CHECKMARKS;
        EXPECT_EQ(GetMenuItemInfoW(menu, kFirstId, FALSE, &item), GetMenuItemCount(menu) == 4);
        EXPECT_EQ(used, item.hbmpChecked && item.hbmpChecked == item.hbmpUnchecked ? 1u : 0u);
        DestroyMenu(menu);
    }
}

TEST_F(ContextMenuTest, KeepsAReferenceToTheManifest)
{
    // A well-meant release would free a manifest that a menu has seen.
    insertMenuItems(nullptr, 0, kFirstId, 0x7FFF, CMF_DEFAULTONLY, Selection());
    StopManifestWatcher();
    for (const BOOL allocated : {TRUE, FALSE}) {
        manifest->Release();
        EXPECT_EQ(HeapValidate(reinterpret_cast<HANDLE>(_get_heap_handle()), 0, manifest), allocated);
    }
}

TEST_F(ContextMenuTest, AnswersVerbsAndHelp)
{
    const test::Catalogue catalogue(service.file(L""), "Restore files in %s from the Tavi servers.",
                                    "Aus %s (100 %) holen: %s");
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
        {0, GCS_VERBW, one, 1, cut, L""},
        {0, GCS_VERBW, one, 0, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, one, 0x80000000, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, one, 100, S_OK, L"Restore an older version of 50%s & more.txt from the Tavi servers."},
        {0, GCS_HELPTEXTW, folder, 100, S_OK, L"Aus caf\u00e9 (100 %) holen: %s"},
        {0, GCS_HELPTEXTA, folder, 9, cut, L"Aus caf\u00e9"},
        {0, GCS_HELPTEXTW, several, 100, S_OK, L"Restore older versions of the selected files."},
        {1, GCS_HELPTEXTW, folder, 100, S_OK, L"Marks caf\u00e9 to be backed up with Tavi Remote Backup."},
        {1, GCS_HELPTEXTA, several, 100, S_OK, L"Marks the selected items to be backed up with Tavi Remote Backup."},
        {2, GCS_HELPTEXTW, one, 100, S_OK, L"Removes 50%s & more.txt from the Tavi Remote Backup configuration."},
        {1, GCS_VALIDATEW, one, 100, S_OK, L"?"},
        {3, GCS_VERBW, one, 100, E_INVALIDARG, L"?"},
    };
    for (const auto& test : cases) {
        wchar_t wide[120] = L"?";
        char narrow[120] = "?";
        const LPSTR buffer = test.type & GCS_UNICODE ? reinterpret_cast<LPSTR>(wide) : narrow;
        EXPECT_EQ(commandString(test.offset, test.type, buffer, test.size, test.selection), test.result) << test.text;
        if (buffer == narrow)
            MultiByteToWideChar(CP_ACP, 0, narrow, -1, wide, 120);
        EXPECT_EQ(std::wstring(wide), test.text);
    }
    EXPECT_EQ(commandString(0, GCS_VERBW, nullptr, 10, one), E_INVALIDARG);
}

TEST_F(ContextMenuTest, InvokesByOffsetOnly)
{
    const auto invoke = [](LPCSTR verb) {
        CMINVOKECOMMANDINFO info{};
        info.lpVerb = verb;
        return invokeCommand(info, selectionOf(L"a", false));
    };
    EXPECT_EQ(invoke("TaviRestore"), E_INVALIDARG);
    for (WORD offset = 1; offset < 6; ++offset)
        EXPECT_EQ(invoke(MAKEINTRESOURCEA(offset)), offset < 3 ? S_OK : E_INVALIDARG);
    EXPECT_EQ(moduleRefCount(), 0);
    EXPECT_EQ(invoke(MAKEINTRESOURCEA(0)), S_OK);
    PostMessageW(test::waitDialog(L"Restore Files"), WM_CLOSE, 0, 0);
    EXPECT_TRUE(test::waitUntil([] { return moduleRefCount() == 0; }));
}

} // namespace
} // namespace tavi
