#include "ui/ContextMenu.h"

#include "tests/support/Dialogs.h"
#include "ui/MenuBitmap.h"
#include "ui/resource.h"

using namespace tavi;

using ContextMenuTest = test::UiTest;

const Selection kFile{{}, {}, Coverage::all, false, L"50%s & more.txt"}, kNone{{}, {}, {}, false, L"a.txt"},
    kFolder{{}, {}, Coverage::all, true, L"caf\u00e9"}, kMixed{{}, {}, Coverage::some, true, {}};

TEST_F(ContextMenuTest, InsertsASeparatorAndTheCommandThatFits)
{
    // How many commands were inserted, then the text and id of each item; a separator has neither.
    const std::tuple<Selection, UINT, UINT, std::wstring> cases[] = {
        {kFile, 0, CMF_EXPLORE, L"1: =0 Restore Previous Version=7 Open=1"},
        {kMixed, 1, CMF_CANRENAME | 0x100, L"1: Open=1 =0 Restore Files=7"},
        {kNone, 1, CMF_NORMAL, L"0: Open=1 =0"},
        {kFile, 0, CMF_DEFAULTONLY, L"0: Open=1"},
        {kFile, 0, CMF_NOVERBS | CMF_EXPLORE, L"0: Open=1"},
    };
    for (const auto& [selection, index, flags, expected] : cases) {
        const HMENU menu = CreatePopupMenu();
        AppendMenuW(menu, MF_STRING, 1, L"Open");
        std::wstring items = std::to_wstring(insertMenuItems(menu, index, 7, flags, selection)) + L":";
        for (int i = 0; i < GetMenuItemCount(menu); ++i) {
            wchar_t text[100] = L"";
            GetMenuStringW(menu, UINT(i), text, 100, MF_BYPOSITION);
            items += std::wstring(L" ") + text + L"=" + std::to_wstring(GetMenuItemID(menu, i));
        }
        EXPECT_EQ(items, expected);
        DestroyMenu(menu);
    }
}

TEST_F(ContextMenuTest, CopiesVerbsAndHelpTextsAndInvokesByOffset)
{
    const std::tuple<UINT, UINT, const Selection&, UINT, HRESULT, wxString> cases[] = {
        {1, GCS_VERBW, kFile, 11, S_OK, L"TaviBackup"},
        {2, GCS_VERBA, kFile, 14, HRESULT(0x8007007A), L"TaviDontBacku"},
        {0, GCS_HELPTEXTW, kFile, 100, S_OK, L"Restore an older version of 50%s & more.txt from the Tavi servers."},
        {0, GCS_HELPTEXTA, kFolder, 22, HRESULT(0x8007007A), L"Restore files in caf\u00e9"},
        {1, GCS_VALIDATEW, kFile, 100, S_OK, L"?"},
        {3, GCS_VERBW, kFile, 100, E_INVALIDARG, L"?"},
    };
    for (const auto& [offset, type, selection, size, result, expected] : cases) {
        wchar_t copied[120] = L"?";
        const auto buffer = reinterpret_cast<LPSTR>(copied);
        EXPECT_EQ(commandString(offset, type, buffer, size, selection), result) << expected;
        EXPECT_EQ(type & GCS_UNICODE ? wxString(copied) : wxString::From8BitData(buffer), expected);
    }
    EXPECT_EQ(commandString(0, GCS_VERBA, nullptr, 100, kFile), E_INVALIDARG);
    for (const auto& [verb, result] : {std::pair<LPCSTR, HRESULT>("TaviRestore", E_INVALIDARG),
                                       {MAKEINTRESOURCEA(2), S_OK},
                                       {MAKEINTRESOURCEA(3), E_INVALIDARG}}) {
        CMINVOKECOMMANDINFO info{};
        info.lpVerb = verb;
        EXPECT_EQ(invokeCommand(info, kFile), result);
    }
}

TEST_F(ContextMenuTest, KeepsTheIconOnItsFirstBackgroundUntilFreed)
{
    constexpr COLORREF kPlain = 0x202020;
    menuBitmap(TAVI_ICON_MENU, 0x00FF00);
    freeMenuBitmaps();
    const HBITMAP bitmap = menuBitmap(TAVI_ICON_MENU, kPlain);
    EXPECT_EQ(menuBitmap(TAVI_ICON_MENU, 0x00FF00), bitmap);
    const MemoryDc dc(CreateCompatibleDC(nullptr));
    SelectObject(dc.get(), bitmap);
    EXPECT_EQ(GetPixel(dc.get(), 0, 0), kPlain);
    EXPECT_NE(GetPixel(dc.get(), GetSystemMetrics(SM_CXMENUCHECK) / 2, GetSystemMetrics(SM_CYMENUCHECK) / 2), kPlain);
}
