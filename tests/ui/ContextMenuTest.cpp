#include "ui/ContextMenu.h"

#include <thread>

#include <malloc.h>

#include "core/InstallPaths.h"
#include "manifest/CurrentManifest.h"
#include "tests/support/Dialogs.h"
#include "ui/MenuBitmap.h"

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
    static Selection selection(const wxString& name, bool isFolder, Coverage versions)
    {
        return {{}, Coverage::none, versions, isFolder, name};
    }

    const Manifest* manifest = nullptr;
    const Selection file = selection(L"50%s & more.txt", false, Coverage::all),
                    folder = selection(L"caf\u00e9", true, Coverage::all), files = selection({}, false, Coverage::some),
                    mixed = selection({}, true, Coverage::some), none = selection(L"a.txt", false, Coverage::none);
};

TEST_F(ContextMenuTest, InsertsTheCommandThatFits)
{
    const std::tuple<Selection, UINT, UINT, std::wstring> cases[] = {
        {file, 0, CMF_NORMAL, L"-|Restore Previous Version|Open|"},
        {folder, 1, CMF_EXPLORE, L"Open|-|Restore Files in Folder|"},
        {files, 1, CMF_NORMAL, L"Open|-|Restore Previous Versions|"},
        {mixed, 0, CMF_CANRENAME | 0x100, L"-|Restore Files|Open|"},
        {none, 1, CMF_NORMAL, L"Open|-|"},
        {file, 0, CMF_DEFAULTONLY, L"Open|"},
        {file, 0, CMF_NOVERBS | CMF_EXPLORE, L"Open|"},
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
        GetMenuItemInfoW(menu, kFirstId, FALSE, &item);
        EXPECT_EQ(used, item.hbmpChecked && item.hbmpChecked == item.hbmpUnchecked ? 1u : 0u) << texts;
        EXPECT_EQ(used, texts.find(L"Restore") == std::wstring::npos ? 0u : 1u);
        DestroyMenu(menu);
    }
}

TEST_F(ContextMenuTest, KeepsTheManifestOfTheNewestMenu)
{
    const auto showMenu = [&] { insertMenuItems(nullptr, 0, kFirstId, CMF_DEFAULTONLY, none); };
    const auto heap = reinterpret_cast<HANDLE>(_get_heap_handle());
    showMenu();
    showMenu();
    // Makes the watcher load the manifest again, within five seconds.
    wxRegKey settings(getSettingsKeyName());
    settings.Create();
    settings.SetValue(L"options.manifestmtime", L"2037-01-02 03:04:05");
    EXPECT_TRUE(test::waitUntil([&] { return getCurrentManifest().get() != manifest; }));
    settings.DeleteSelf();
    manifest->Release();
    EXPECT_TRUE(HeapValidate(heap, 0, manifest)) << "a menu has seen it";
    showMenu();
    EXPECT_TRUE(test::waitUntil([&] { return !HeapValidate(heap, 0, manifest); })) << "manifests pile up";
    const Manifest* const next = getCurrentManifest().get();
    stopManifestWatcher();
    EXPECT_FALSE(HeapValidate(heap, 0, next));
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
    const auto invoke = [&](LPCSTR verb, HRESULT result, int dialogs) {
        CMINVOKECOMMANDINFO info{};
        info.lpVerb = verb;
        EXPECT_EQ(invokeCommand(info, file), result);
        EXPECT_EQ(moduleRefCount(), dialogs);
    };
    invoke("TaviRestore", E_INVALIDARG, 0);
    invoke(MAKEINTRESOURCEA(1), S_OK, 0);
    invoke(MAKEINTRESOURCEA(2), S_OK, 0);
    invoke(MAKEINTRESOURCEA(3), E_INVALIDARG, 0);
    invoke(MAKEINTRESOURCEA(0), S_OK, 1);
    test::click(test::waitDialog(L"Restore Files"), IDCANCEL);
    test::waitForThreads();
    // After this only this thread could start a watcher, and so get a new manifest.
    stopManifestWatcher();
    std::thread([&] { invoke(MAKEINTRESOURCEA(0), S_OK, 0); }).join();
}

} // namespace
} // namespace tavi
