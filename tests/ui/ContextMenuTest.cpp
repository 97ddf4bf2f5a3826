#include "ui/ContextMenu.h"

#include <thread>

#include "manifest/CurrentManifest.h"
#include "tests/support/Dialogs.h"
#include "ui/MenuBitmap.h"

namespace tavi {
namespace {

constexpr UINT kFirstId = 0x7001;

struct ContextMenuTest : test::UiTest {
    ~ContextMenuTest() override
    {
        freeMenuBitmaps();
        stopManifestWatcher();
        EXPECT_TRUE(test::waitUntil([] { return !isWatcherActive(); }));
    }
    const Selection file{{}, {}, Coverage::all, false, L"50%s & more.txt"}, none{{}, {}, {}, false, L"a.txt"},
        folder{{}, {}, Coverage::all, true, L"caf\u00e9"}, files{{}, {}, Coverage::some, false, {}},
        mixed{{}, {}, Coverage::some, true, {}};
};

TEST_F(ContextMenuTest, InsertsTheCommandThatFits)
{
    const std::tuple<Selection, UINT, UINT, int, const wchar_t*> cases[] = {
        {file, 0, CMF_NORMAL, 3, L"Restore Previous Version"},
        {folder, 1, CMF_EXPLORE, 3, L"Restore Files in Folder"},
        {files, 1, CMF_NORMAL, 3, L"Restore Previous Versions"},
        {mixed, 0, CMF_CANRENAME | 0x100, 3, L"Restore Files"},
        {none, 1, CMF_NORMAL, 2, L""}, // the separator alone
        {file, 0, CMF_DEFAULTONLY, 1, L""},
        {file, 0, CMF_NOVERBS | CMF_EXPLORE, 1, L""},
    };
    for (const auto& [selection, index, flags, count, label] : cases) {
        const HMENU menu = CreatePopupMenu();
        AppendMenuW(menu, MF_STRING, 1, L"Open");
        EXPECT_EQ(insertMenuItems(menu, index, kFirstId, flags, selection), count == 3 ? 1u : 0u) << label;
        EXPECT_EQ(GetMenuItemCount(menu), count);
        EXPECT_EQ((GetMenuState(menu, index, MF_BYPOSITION) & MF_SEPARATOR) != 0, count > 1);
        wchar_t text[100] = L"";
        GetMenuStringW(menu, index + 1, text, 100, MF_BYPOSITION);
        EXPECT_TRUE(count < 3 || (std::wcscmp(text, label) == 0 && GetMenuItemID(menu, int(index) + 1) == kFirstId))
            << text;
        DestroyMenu(menu);
    }
}

TEST_F(ContextMenuTest, CopiesVerbsAndHelpTexts)
{
    translate("Restore files in %s from the Tavi servers.", "Aus %s (100 %) holen: %s");
    constexpr HRESULT cut = static_cast<HRESULT>(0x8007007A);
    const std::tuple<UINT, UINT, const Selection&, UINT, HRESULT, std::wstring> cases[] = {
        {1, GCS_VERBW, files, 100, S_OK, L"TaviBackup"},
        {2, GCS_VERBA, files, 15, S_OK, L"TaviDontBackup"},
        {2, GCS_VERBA, files, 14, cut, L"TaviDontBacku"},
        {0, GCS_VERBW, file, 0, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, file, 0x80000000, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, file, 100, S_OK, L"Restore an older version of 50%s & more.txt from the Tavi servers."},
        {0, GCS_HELPTEXTW, folder, 100, S_OK, L"Aus caf\u00e9 (100 %) holen: %s"},
        {0, GCS_HELPTEXTA, folder, 9, cut, L"Aus caf\u00e9"},
        {1, GCS_HELPTEXTA, mixed, 100, S_OK, L"Marks the selected items to be backed up with Tavi Remote Backup."},
        {1, GCS_VALIDATEW, file, 100, S_OK, L"?"},
        {3, GCS_VERBW, file, 100, E_INVALIDARG, L"?"},
    };
    for (const auto& [offset, type, selection, size, result, expected] : cases) {
        wchar_t wide[120] = L"?";
        char narrow[120] = "?";
        const LPSTR buffer = type & GCS_UNICODE ? reinterpret_cast<LPSTR>(wide) : narrow;
        EXPECT_EQ(commandString(offset, type, buffer, size, selection), result) << expected;
        if (buffer == narrow)
            MultiByteToWideChar(CP_ACP, 0, narrow, -1, wide, 120);
        EXPECT_EQ(wide, expected);
    }
    EXPECT_EQ(commandString(0, GCS_VERBA, nullptr, 100, file), E_INVALIDARG);
}

TEST_F(ContextMenuTest, InvokesByOffsetAndOnlyWithAManifest)
{
    test::waitUntil([] { return static_cast<bool>(getCurrentManifest()); });
    const auto invoke = [&](LPCSTR verb, HRESULT result, int dialogs) {
        CMINVOKECOMMANDINFO info{};
        info.lpVerb = verb;
        EXPECT_EQ(invokeCommand(info, file), result);
        EXPECT_EQ(moduleRefCount(), dialogs);
    };
    invoke("TaviRestore", E_INVALIDARG, 0);
    for (const UINT_PTR offset : {1u, 2u, 3u})
        invoke(reinterpret_cast<LPCSTR>(offset), offset < 3 ? S_OK : E_INVALIDARG, 0);
    invoke(MAKEINTRESOURCEA(0), S_OK, 1);
    test::click(test::waitDialog(L"Restore Files"), IDCANCEL);
    test::waitForThreads();
    // After this only this thread could start a watcher, and so get a new manifest.
    stopManifestWatcher();
    std::thread([&] { invoke(MAKEINTRESOURCEA(0), S_OK, 0); }).join();
}

} // namespace
} // namespace tavi
