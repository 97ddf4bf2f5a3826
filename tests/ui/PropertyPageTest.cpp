#include "ui/PropertyPage.h"

#include <commctrl.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/Dialogs.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;
using PropertyPageTest = UiTest;

HPROPSHEETPAGE pageFor(const PathSet& paths, bool isAccepted = true)
{
    HPROPSHEETPAGE page = nullptr;
    addPropertyPage({paths, {}, {}, false, {}},
                    Manifest::parse(L"FILES\nC:\\f\n5:5:5:5:0::0:0\n\nC:\\gone\n5:5:5:5:0::0:0\n6:5:5:-1:0::0:0"),
                    takePage, isAccepted ? reinterpret_cast<LPARAM>(&page) : 0);
    return page;
}

HWND openSheet()
{
    HPROPSHEETPAGE page = pageFor({L"C:\\f"});
    PROPSHEETHEADERW header{};
    header.dwSize = sizeof(header);
    header.dwFlags = PSH_MODELESS;
    header.nPages = 1;
    header.phpage = &page;
    return reinterpret_cast<HWND>(PropertySheetW(&header));
}

// Wine ignores the page description's reference counter. Windows adds one to each module count below while its page
// exists.
TEST_F(PropertyPageTest, IsOfferedForABackedUpFileAndDestroyedOnce)
{
    const std::pair<PathSet, int> cases[] = {
        {{}, 0}, {{L"C:\\"}, 0}, {{L"C:\\none"}, 0}, {{L"C:\\gone"}, 0}, {{L"C:\\f"}, 1}, {{L"C:\\none", L"C:\\f"}, 1}};
    for (const auto& [paths, count] : cases) {
        const HPROPSHEETPAGE page = pageFor(paths);
        EXPECT_EQ(page != nullptr, count == 1);
        EXPECT_EQ(moduleRefCount(), count);
        DestroyPropertySheetPage(page);
        EXPECT_EQ(moduleRefCount(), 0);
    }
    pageFor({L"C:\\f"}, false);
    addPropertyPage(Selection(), ManifestRef(), takePage, 0);
    EXPECT_EQ(moduleRefCount(), 0);
}

TEST_F(PropertyPageTest, EndsWithItsSheetAndNotBefore)
{
    translate("Tavi", "Sicherung");
    const std::tuple<bool, UINT, WPARAM> cases[] = {
        {true, WM_COMMAND, IDCANCEL}, {false, PSM_PRESSBUTTON, PSBTN_OK}, {false, WM_SYSCOMMAND, SC_CLOSE}};
    for (const auto& [isOfPage, end, parameter] : cases) {
        const HWND sheet = openSheet(), page = PropSheet_GetCurrentPageHwnd(sheet);
        wchar_t title[50] = L"";
        TCITEMW tab{TCIF_TEXT, 0, 0, title, 50, 0, 0};
        TabCtrl_GetItem(PropSheet_GetTabControl(sheet), 0, &tab);
        EXPECT_STREQ(title, L"Sicherung");
        EXPECT_EQ(ListView_GetItemCount(GetDlgItem(page, TAVI_VERSIONS_LIST)), 1);
        PostMessageW(page, WM_CLOSE, 0, 0); // must do nothing
        PostMessageW(isOfPage ? page : sheet, end, parameter, 0);
        MSG message;
        EXPECT_TRUE(waitUntil([&] {
            EXPECT_TRUE(IsWindow(page));
            if (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE) &&
                !SendMessageW(sheet, PSM_ISDIALOGMESSAGE, 0, reinterpret_cast<LPARAM>(&message)))
                DispatchMessageW(&message);
            return !PropSheet_GetCurrentPageHwnd(sheet);
        })) << "the sheet ends";
        EXPECT_EQ(moduleRefCount(), 1);
        DestroyWindow(sheet);
        EXPECT_EQ(moduleRefCount(), 0) << end;
        EXPECT_FALSE(PeekMessageW(&message, nullptr, WM_QUIT, WM_QUIT, PM_REMOVE)) << "the thread goes on";
    }
}

HWND questionedSheet;

// Destroys the sheet while its page asks a question, on the sheet's own thread.
void CALLBACK destroyDuringQuestion(HWND, UINT, UINT_PTR timer, DWORD)
{
    const HWND box = FindWindowW(L"#32770", L"Tavi Remote Backup");
    if (!box)
        return;
    KillTimer(nullptr, timer);
    DestroyWindow(questionedSheet);
    EXPECT_EQ(moduleRefCount(), 1) << "the frames of the question";
    PostMessageW(box, WM_COMMAND, IDCANCEL, 0);
}

TEST_F(PropertyPageTest, CountsUntilItsLastFrameHasReturned)
{
    questionedSheet = openSheet();
    SetTimer(nullptr, 0, 10, destroyDuringQuestion);
    SendMessageW(PropSheet_GetCurrentPageHwnd(questionedSheet), WM_COMMAND, TAVI_VERSIONS_RESTORE, 0);
    EXPECT_FALSE(IsWindow(questionedSheet));
    EXPECT_EQ(moduleRefCount(), 0);
}

} // namespace
} // namespace tavi
