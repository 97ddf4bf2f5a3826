#include "ui/PropertyPage.h"

#include <commctrl.h>

#include "tests/support/Dialogs.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;
using PropertyPageTest = UiTest;

struct Pages {
    bool accepted = true;
    std::vector<HPROPSHEETPAGE> handles;
};

BOOL CALLBACK take(HPROPSHEETPAGE page, LPARAM parameter)
{
    auto& pages = *reinterpret_cast<Pages*>(parameter);
    if (pages.accepted)
        pages.handles.push_back(page);
    return pages.accepted;
}

void offer(Pages& pages, const PathSet& paths)
{
    Manifest* const manifest =
        Manifest::Parse(L"FILES\nC:\\f\n5:5:5:5:0::0:0\n\nC:\\gone\n5:5:5:5:0::0:0\n6:5:5:-1:0::0:0");
    manifest->AddRef();
    addPropertyPage({paths, 0, 1, false, {}}, ManifestRef(manifest), take, reinterpret_cast<LPARAM>(&pages));
}

// Wine ignores the page description's reference counter. Windows adds one to each module count below while its page
// exists.
TEST_F(PropertyPageTest, IsOfferedForWhatIsBackedUp)
{
    const std::pair<PathSet, std::size_t> cases[] = {
        {{}, 0}, {{L"C:\\"}, 0}, {{L"C:\\none"}, 0}, {{L"C:\\gone"}, 0}, {{L"C:\\f"}, 1}, {{L"C:\\none", L"C:\\f"}, 1}};
    for (const auto& [paths, count] : cases) {
        Pages pages;
        offer(pages, paths);
        EXPECT_EQ(pages.handles.size(), count);
        EXPECT_EQ(moduleRefCount(), static_cast<int>(count)) << "the page counts";
        for (const HPROPSHEETPAGE page : pages.handles)
            DestroyPropertySheetPage(page);
        EXPECT_EQ(moduleRefCount(), 0) << "never shown, freed once";
    }
    Pages refusing{false, {}};
    offer(refusing, {L"C:\\f"});
    addPropertyPage({{L"C:\\f"}, 0, 1, false, {}}, ManifestRef(nullptr), take, 0);
    EXPECT_EQ(moduleRefCount(), 0);
}

TEST_F(PropertyPageTest, LivesAndGoesWithItsSheet)
{
    translate("Tavi", "Sicherung");
    enum End { pageCancels, sheetCancels, sheetConfirms, sheetCloses };
    for (const End end : {pageCancels, sheetCancels, sheetConfirms, sheetCloses}) {
        Pages pages;
        offer(pages, {L"C:\\f"});
        PROPSHEETHEADERW header{};
        header.dwSize = sizeof(header);
        header.dwFlags = PSH_MODELESS;
        header.pszCaption = L"f Properties";
        header.nPages = 1;
        header.phpage = pages.handles.data();
        const auto sheet = reinterpret_cast<HWND>(PropertySheetW(&header));
        const auto page = reinterpret_cast<HWND>(SendMessageW(sheet, PSM_GETCURRENTPAGEHWND, 0, 0));
        wchar_t title[50] = L"";
        TCITEMW tab{TCIF_TEXT, 0, 0, title, 50, 0, 0};
        SendMessageW(reinterpret_cast<HWND>(SendMessageW(sheet, PSM_GETTABCONTROL, 0, 0)), TCM_GETITEMW, 0,
                     reinterpret_cast<LPARAM>(&tab));
        EXPECT_STREQ(title, L"Sicherung");
        EXPECT_EQ(ListView_GetItemCount(GetDlgItem(page, TAVI_VERSIONS_LIST)), 1);
        // A page is not closed by itself.
        PostMessageW(page, WM_CLOSE, 0, 0);
        if (end == pageCancels)
            click(page, IDCANCEL);
        else if (end == sheetCloses)
            PostMessageW(sheet, WM_SYSCOMMAND, SC_CLOSE, 0);
        else
            PostMessageW(sheet, PSM_PRESSBUTTON, end == sheetConfirms ? PSBTN_OK : PSBTN_CANCEL, 0);
        const DWORD start = GetTickCount();
        MSG message;
        while (SendMessageW(sheet, PSM_GETCURRENTPAGEHWND, 0, 0) && GetTickCount() - start < 5000) {
            EXPECT_TRUE(IsWindow(page));
            if (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE) &&
                !SendMessageW(sheet, PSM_ISDIALOGMESSAGE, 0, reinterpret_cast<LPARAM>(&message))) {
                TranslateMessage(&message);
                DispatchMessageW(&message);
            }
        }
        EXPECT_LT(GetTickCount() - start, 5000u) << "the sheet has come to its end";
        EXPECT_EQ(moduleRefCount(), 1);
        DestroyWindow(sheet);
        EXPECT_EQ(moduleRefCount(), 0) << end;
        EXPECT_FALSE(PeekMessageW(&message, nullptr, WM_QUIT, WM_QUIT, PM_REMOVE)) << "the thread goes on";
    }
}

// The sheet, and when its page asks a question: only its own thread can destroy it.
HWND questionedSheet;
int countInside;

void CALLBACK destroyDuringQuestion(HWND, UINT, UINT_PTR timer, DWORD)
{
    const HWND box = FindWindowW(L"#32770", L"Tavi Remote Backup");
    if (!box)
        return;
    KillTimer(nullptr, timer);
    DestroyWindow(questionedSheet);
    countInside = moduleRefCount();
    PostMessageW(box, WM_COMMAND, IDCANCEL, 0);
}

TEST_F(PropertyPageTest, CountsUntilItsLastFrameHasReturned)
{
    Pages pages;
    offer(pages, {L"C:\\f"});
    PROPSHEETHEADERW header{};
    header.dwSize = sizeof(header);
    header.dwFlags = PSH_MODELESS;
    header.nPages = 1;
    header.phpage = pages.handles.data();
    questionedSheet = reinterpret_cast<HWND>(PropertySheetW(&header));
    const auto page = reinterpret_cast<HWND>(SendMessageW(questionedSheet, PSM_GETCURRENTPAGEHWND, 0, 0));
    countInside = -1;
    SetTimer(nullptr, 0, 10, destroyDuringQuestion);
    // Returns when the box has gone.
    SendMessageW(page, WM_COMMAND, TAVI_VERSIONS_RESTORE, 0);
    EXPECT_FALSE(IsWindow(questionedSheet));
    EXPECT_EQ(countInside, 1) << "the frames of the question";
    EXPECT_EQ(moduleRefCount(), 0);
}

} // namespace
} // namespace tavi
