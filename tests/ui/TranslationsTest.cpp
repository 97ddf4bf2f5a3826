#include "ui/Translations.h"

#include <windows.h>
#include <commctrl.h>

#include "core/DisplayFormat.h"
#include "core/ScopeGuard.h"
#include "tests/support/Allocations.h"
#include "tests/support/Dialogs.h"
#include "ui/ContextMenu.h"
#include "ui/DialogLayout.h"
#include "ui/PropertyPage.h"
#include "ui/resource.h"
#include "ui/RestoreProgressWindow.h"
#include "ui/VersionsDialog.h"
#include "ui/VersionsWindow.h"

using namespace tavi;
using namespace tavi::test;

HWND createDialog(int resource)
{
    return CreateDialogParamW(moduleInstance(), MAKEINTRESOURCEW(resource), nullptr, nullptr, 0);
}

RECT placeIn(HWND dialog, int id)
{
    RECT place{};
    GetWindowRect(GetDlgItem(dialog, id), &place);
    MapWindowPoints(nullptr, dialog, reinterpret_cast<POINT*>(&place), 2);
    return place;
}

// This program's catalogues "qps" and "he" have the English texts in brackets, with accents and 40 % longer.
struct TranslationsTest : UiTest {
    void expectTranslated(const wxString& text) const
    {
        EXPECT_EQ(text.Matches(L"*[*]*"), language == L"qps" || language == L"he") << text;
    }
    void expectCaption(HWND window) const
    {
        wchar_t caption[100] = L"";
        expectTranslated(wxString(caption, std::size_t(GetWindowTextW(window, caption, 100))));
    }
    // Each visible control has a translated text that it has room for, and a place of its own: in English the
    // template's.
    void expectLayout(HWND dialog, int resource) const
    {
        const HWND bare = createDialog(resource);
        RECT all{}, common{};
        GetClientRect(dialog, &all);
        std::map<int, RECT> places;
        wxString keys;
        for (HWND next = GetWindow(dialog, GW_CHILD); next; next = GetWindow(next, GW_HWNDNEXT)) {
            const int id = GetDlgCtrlID(next);
            SCOPED_TRACE(id);
            const LONG style = GetWindowLongW(next, GWL_STYLE);
            const RECT place = placeIn(dialog, id), original = placeIn(bare, id);
            EXPECT_TRUE(language != L"en" || EqualRect(&place, &original));
            if (!(style & WS_VISIBLE))
                continue;
            EXPECT_TRUE(UnionRect(&common, &all, &place) && EqualRect(&common, &all)) << "leaves the window";
            for (const auto& [other, its] : places)
                EXPECT_FALSE(IntersectRect(&common, &place, &its)) << other;
            places[id] = place;
            const wxString text = controlText(dialog, id), key = text.AfterFirst(L'&').Left(1).Lower();
            if (text.empty() || id == TAVI_VERSIONS_ICON)
                continue;
            expectTranslated(text);
            EXPECT_TRUE(language != L"de" || key.empty() || !keys.Contains(key)) << "a key twice, as in English";
            keys += key;
            const LONG width = place.right - place.left;
            SIZE needed = TextRuler(next).measure(text, width, style & SS_NOPREFIX ? DT_NOPREFIX : 0);
            if (!Button_GetIdealSize(next, &needed) && style & SS_ELLIPSISMASK)
                needed.cx = 0;
            EXPECT_LE(needed.cx, width) << text;
            EXPECT_LE(needed.cy, place.bottom - place.top) << text;
        }
        EXPECT_EQ((GetWindowLongW(dialog, GWL_EXSTYLE) & WS_EX_LAYOUTRTL) != 0, language == L"he");
        DestroyWindow(bare);
    }
    void expectEveryWindow() const
    {
        const ManifestRef manifest = Manifest::parse(L"FILES\nC:\\f\n5:5:5:5:0::0:0\n\nsimple.map\n4:1:1:1:0::0:0");
        const Selection one{{L"C:\\f"}, {}, Coverage::all, false, L"f"}, several{{L"C:\\d"}, {}, Coverage{1}, true, {}};
        for (const Selection& selection : {one, several}) {
            wchar_t text[100] = L"";
            const HMENU menu = CreatePopupMenu();
            insertMenuItems(menu, 0, 1, CMF_NORMAL, selection);
            GetMenuStringW(menu, 1, text, 100, MF_BYPOSITION);
            DestroyMenu(menu);
            expectTranslated(text);
            commandString(0, GCS_HELPTEXTW, reinterpret_cast<LPSTR>(text), 100, selection);
            expectTranslated(text);
            for (const int button : {TAVI_VERSIONS_RESTORE, TAVI_VERSIONS_COPY_TO}) {
                openVersionsWindow(selection, manifest, nullptr);
                const HWND dialog = waitDialog(nullptr);
                expectCaption(dialog);
                expectLayout(dialog, TAVI_DIALOG_VERSIONS);
                LVCOLUMNW column{LVCF_TEXT, 0, 0, text, 50, 0, 0, 0, 0, 0, 0};
                ListView_GetColumn(GetDlgItem(dialog, TAVI_VERSIONS_LIST), 0, &column);
                expectTranslated(text);
                click(dialog, button);
                HWND box = waitDialog(nullptr, dialog);
                if (const HWND tree = FindWindowExW(box, nullptr, WC_TREEVIEWW, nullptr)) {
                    expectTranslated(controlText(box, 14146));
                    EXPECT_TRUE(waitUntil([&] { return TreeView_GetSelection(tree) != nullptr; }));
                    click(box, IDOK);
                    box = waitDialog(nullptr, dialog, box);
                }
                expectCaption(box);
                if (GetDlgItem(box, 0xFFFF))
                    expectTranslated(controlText(box, 0xFFFF));
                click(box, IDCANCEL);
                EXPECT_TRUE(waitUntil([&] { return !IsWindow(dialog); }));
            }
        }
        HPROPSHEETPAGE page = nullptr;
        addPropertyPage(one, manifest, takePage, reinterpret_cast<LPARAM>(&page));
        PROPSHEETHEADERW header{sizeof(header), PSH_MODELESS, {}, {}, {}, {}, 1, {}, {}, {}, {}, {}, {}};
        header.phpage = &page;
        const HWND sheet = reinterpret_cast<HWND>(PropertySheetW(&header));
        expectLayout(PropSheet_GetCurrentPageHwnd(sheet), TAVI_DIALOG_VERSIONS);
        DestroyWindow(sheet);
        RestoreProgressWindow::getOrCreate();
        const HWND progress = waitDialog(nullptr);
        // In English, whose places are fixed, the widest rate does not fit.
        SetDlgItemTextW(progress, TAVI_PROGRESS_SPEED, formatRate(language == L"en" ? 999 : (1u << 30) - 1).wc_str());
        expectCaption(progress);
        expectLayout(progress, TAVI_DIALOG_PROGRESS);
        PostMessageW(progress, WM_CLOSE, 0, 0);
        EXPECT_TRUE(waitUntil([] { return moduleRefCount() == 0; }));
    }
    std::wstring language;
};

TEST_F(TranslationsTest, ReachEveryWindowAndFitIn)
{
    const wchar_t* const dpi = _wgetenv(L"TAVI_TEST_DPI");
    EXPECT_EQ(GetDeviceCaps(ScreenDc(GetDC(nullptr)).get(), LOGPIXELSX), dpi ? _wtoi(dpi) : 96);
    for (const wchar_t* each : {L"en", L"de", L"qps", L"he"}) {
        SCOPED_TRACE(language = each);
        freeTranslations();
        loadTranslations({language});
        expectEveryWindow();
    }
}

// A process has the resolution of its start.
TEST(TranslationsAt144DpiTest, ReachEveryWindowAndFitIn)
{
    wxRegKey desktop(wxRegKey::HKCU, L"Control Panel\\Desktop");
    desktop.SetValue(L"LogPixels", 144);
    _wputenv_s(L"TAVI_TEST_DPI", L"144");
    const ScopeGuard restored([&] { desktop.DeleteValue(L"LogPixels"); });
    EXPECT_EQ(_wspawnl(_P_WAIT, _wpgmptr, L"t", L"--gtest_filter=TranslationsTest.ReachEveryWindowAndFitIn", nullptr),
              0);
}

TEST_F(TranslationsTest, TakeRoomForALongMessageFromTheListBelow)
{
    const HWND dialog = createDialog(TAVI_DIALOG_VERSIONS);
    SetDlgItemTextW(dialog, TAVI_VERSIONS_MESSAGE, L"1\n2\n3\n4\n5\n6\n7\n8\n9");
    fitMessage(dialog, TAVI_VERSIONS_MESSAGE, TAVI_VERSIONS_LABEL, TAVI_VERSIONS_LIST);
    expectLayout(dialog, TAVI_DIALOG_VERSIONS);
    DestroyWindow(dialog);
}

TEST_F(TranslationsTest, AreThoseOfTheFirstDisplayLanguageThatFits)
{
    const std::pair<std::vector<std::wstring>, wxString> cases[] = {
        {{L"xx-XX"}, L"1 day, 2 hours"},
        {{L"en-GB", L"de-DE"}, L"1 day, 2 hours"},
        {{L"xx", L"de-Latn-AT", L"en"}, L"1 Tag, 2 Stunden"}};
    for (const auto& [languages, expected] : cases) {
        freeTranslations();
        loadTranslations(languages);
        EXPECT_EQ(formatDuration(93600), expected);
    }
    const std::function<void()> firstTexts[] = {[] { insertMenuItems(nullptr, 0, 1, CMF_NORMAL, {}); },
                                                [] { commandString(0, GCS_HELPTEXTW, nullptr, 0, {}); },
                                                [] { VersionsDialog({}, ManifestRef()); }};
    for (const auto& show : firstTexts) {
        freeTranslations();
        show(); // loads the user's language, English
        loadTranslations({L"de"});
        EXPECT_FALSE(isTranslated());
    }
    freeTranslations();
    const FailingAllocations failing(0, Heap::c, 1 << 30, 10000);
    EXPECT_THROW(loadTranslations({L"de"}), std::bad_alloc);
    EXPECT_THROW(loadTranslations({L"de"}), std::bad_alloc) << "it tries again";
}
