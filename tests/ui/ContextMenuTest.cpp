#include "ui/ContextMenu.h"

#include <thread>

#include <malloc.h>

#include "manifest/CurrentManifest.h"
#include "core/Handles.h"
#include "core/InstallPaths.h"
#include "tests/support/Dialogs.h"
#include "ui/MenuBitmap.h"
#include "ui/resource.h"

namespace tavi {
namespace {

constexpr UINT kFirstId = 0x7001;

struct ContextMenuTest : test::UiTest {
    ContextMenuTest()
    {
        test::waitUntil([&] { return (manifest = getCurrentManifest().release()) != nullptr; });
    }
    ~ContextMenuTest() override
    {
        freeMenuBitmaps();
        stopManifestWatcher();
        EXPECT_TRUE(test::waitUntil([] { return !isWatcherActive(); }));
    }

    const Manifest* manifest = nullptr;
    const Selection one{{}, 0, 1, false, L"50%s & more.txt"}, folder{{}, 0, 1, true, L"caf\u00e9"},
        files{{}, 0, -1, false, {}}, mixed{{}, 0, -1, true, {}}, none{{}, 0, 0, false, L"a.txt"};
};

TEST_F(ContextMenuTest, InsertsTheCommandThatFits)
{
    const std::tuple<Selection, UINT, UINT, std::wstring> cases[] = {
        {one, 0, CMF_NORMAL, L"-|Restore Previous Version|Open|"},
        {folder, 1, CMF_EXPLORE, L"Open|-|Restore Files in Folder|"},
        {files, 1, CMF_NORMAL, L"Open|-|Restore Previous Versions|"},
        {mixed, 0, CMF_CANRENAME | 0x100, L"-|Restore Files|Open|"},
        {none, 1, CMF_NORMAL, L"Open|-|"},
        {one, 0, CMF_DEFAULTONLY, L"Open|"},
        {one, 0, CMF_NOVERBS | CMF_EXPLORE, L"Open|"},
    };
    for (const auto& [selection, index, flags, expected] : cases) {
        const HMENU menu = CreatePopupMenu();
        AppendMenuW(menu, MF_STRING, 1, L"Open");
        const UINT used = insertMenuItems(menu, index, kFirstId, flags, selection);
        std::wstring texts;
        for (UINT i = 0; static_cast<int>(i) < GetMenuItemCount(menu); ++i) {
            wchar_t text[200] = L"";
            GetMenuStringW(menu, i, text, 200, MF_BYPOSITION);
            texts += GetMenuState(menu, i, MF_BYPOSITION) & MF_SEPARATOR ? L"-|" : text + std::wstring(L"|");
        }
        EXPECT_EQ(texts, expected);
        MENUITEMINFOW item{};
        item.cbSize = sizeof(item);
        item.fMask = MIIM_CHECKMARKS;
        EXPECT_EQ(GetMenuItemInfoW(menu, kFirstId, FALSE, &item), GetMenuItemCount(menu) == 3);
        EXPECT_EQ(used, item.hbmpChecked && item.hbmpChecked == item.hbmpUnchecked ? 1u : 0u);
        DestroyMenu(menu);
    }
}

TEST_F(ContextMenuTest, KeepsTheManifestOfTheNewestMenu)
{
    const auto showMenu = [&] { insertMenuItems(nullptr, 0, kFirstId, CMF_DEFAULTONLY, none); };
    const auto heap = reinterpret_cast<HANDLE>(_get_heap_handle());
    showMenu();
    showMenu();
    // The watcher's own wait: five seconds until it sees the change.
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2037-01-02 03:04:05");
    const Manifest* next = nullptr;
    EXPECT_TRUE(test::waitUntil([&] {
        next = getCurrentManifest().get();
        return next != manifest;
    }));
    settings.DeleteSelf();
    // A well-meant release would free a manifest that a menu has seen; without any, manifests would pile up.
    manifest->Release();
    EXPECT_TRUE(HeapValidate(heap, 0, manifest));
    showMenu();
    EXPECT_TRUE(test::waitUntil([&] { return !HeapValidate(heap, 0, manifest); })) << "within the watcher's next nap";
    stopManifestWatcher();
    EXPECT_FALSE(HeapValidate(heap, 0, next));
}

TEST_F(ContextMenuTest, AnswersVerbsAndHelp)
{
    translate("Restore files in %s from the Tavi servers.", "Aus %s (100 %) holen: %s");
    constexpr HRESULT cut = static_cast<HRESULT>(0x8007007A);
    const std::tuple<UINT, UINT, const Selection&, UINT, HRESULT, std::wstring> cases[] = {
        {1, GCS_VERBW, files, 100, S_OK, L"TaviBackup"},
        {2, GCS_VERBA, files, 15, S_OK, L"TaviDontBackup"},
        {2, GCS_VERBA, files, 14, cut, L"TaviDontBacku"},
        {0, GCS_HELPTEXTW, one, 0x80000000, E_INVALIDARG, L"?"},
        {0, GCS_HELPTEXTW, one, 100, S_OK, L"Restore an older version of 50%s & more.txt from the Tavi servers."},
        {0, GCS_HELPTEXTW, folder, 100, S_OK, L"Aus caf\u00e9 (100 %) holen: %s"},
        {0, GCS_HELPTEXTA, folder, 9, cut, L"Aus caf\u00e9"},
        {1, GCS_HELPTEXTA, mixed, 100, S_OK, L"Marks the selected items to be backed up with Tavi Remote Backup."},
        {1, GCS_VALIDATEW, one, 100, S_OK, L"?"},
        {3, GCS_VERBW, one, 100, E_INVALIDARG, L"?"},
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
}

TEST_F(ContextMenuTest, InvokesByOffsetAndWithAManifestOnly)
{
    const auto invoke = [&](LPCSTR verb, HRESULT result, int opened) {
        CMINVOKECOMMANDINFO info{};
        info.lpVerb = verb;
        EXPECT_EQ(invokeCommand(info, one), result);
        EXPECT_EQ(moduleRefCount(), opened);
    };
    invoke("TaviRestore", E_INVALIDARG, 0);
    invoke(MAKEINTRESOURCEA(1), S_OK, 0);
    invoke(MAKEINTRESOURCEA(2), S_OK, 0);
    invoke(MAKEINTRESOURCEA(3), E_INVALIDARG, 0);
    invoke(MAKEINTRESOURCEA(0), S_OK, 1);
    test::click(test::waitDialog(L"Restore Files"), IDCANCEL);
    test::waitForThreads();
    // Keeps the start of a watcher, and so a new manifest, from every other thread.
    stopManifestWatcher();
    std::thread([&] { invoke(MAKEINTRESOURCEA(0), S_OK, 0); }).join();
}

using MenuBitmapTest = test::UiTest;

TEST_F(MenuBitmapTest, IsTheIconOnTheFirstBackgroundUntilFreed)
{
    for (const COLORREF plain : {0xF0F0F0ul, 0x202020ul}) {
        const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, plain);
        // Other ids, below and above, do not disturb it, nor does another colour.
        EXPECT_NE(menuBitmap(TAVI_ICON_OVERLAY, 0), menuBitmap(TAVI_ICON_RESTORE, 0));
        EXPECT_EQ(menuBitmap(136, 0), nullptr);
        EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, 0x00FF00), bitmap);
        const MemoryDc dc(CreateCompatibleDC(nullptr));
        const HGDIOBJ before = SelectObject(dc.get(), bitmap);
        const int width = GetSystemMetrics(SM_CXMENUCHECK), size = width * GetSystemMetrics(SM_CYMENUCHECK);
        int bare = 0;
        for (int i = 0; i < size; ++i)
            bare += GetPixel(dc.get(), i % width, i / width) == plain ? 1 : 0;
        EXPECT_TRUE(bare > size / 5 && bare < size * 4 / 5) << "the icon on the background, at " << bare;
        SelectObject(dc.get(), before);
        freeMenuBitmaps();
        EXPECT_EQ(GetObjectType(bitmap), 0u);
    }
}

} // namespace
} // namespace tavi
