#include "ui/PropertyPage.h"

#include <thread>

#include <commctrl.h>

#include "tests/support/Dialogs.h"
#include "ui/resource.h"

using namespace tavi;

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

HWND openSheet(HWND owner = nullptr)
{
    HPROPSHEETPAGE page = pageFor({L"C:\\f"});
    PROPSHEETHEADERW header{sizeof(header), PSH_MODELESS, owner, nullptr, {}, nullptr, 1, {}, {}, nullptr, {}, {}, {}};
    header.phpage = &page;
    return reinterpret_cast<HWND>(PropertySheetW(&header));
}

// Wine ignores the page's reference counter. Windows adds one to each module count below while its page exists.
TEST_F(PropertyPageTest, IsOfferedForABackedUpFileAndDestroyedOnce)
{
    for (const auto& [paths, count] :
         {std::pair<PathSet, int>({L"C:\\"}, 0), {{L"C:\\gone"}, 0}, {{L"C:\\none", L"C:\\f"}, 1}}) {
        const HPROPSHEETPAGE page = pageFor(paths);
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
    for (const auto& [end, parameter] : {std::pair(WM_COMMAND, IDCANCEL), {PSM_PRESSBUTTON, PSBTN_OK}}) {
        const HWND sheet = openSheet(), page = PropSheet_GetCurrentPageHwnd(sheet);
        EXPECT_EQ(ListView_GetItemCount(GetDlgItem(page, TAVI_VERSIONS_LIST)), 1);
        PostMessageW(page, WM_CLOSE, 0, 0); // must do nothing
        PostMessageW(end == WM_COMMAND ? page : sheet, UINT(end), WPARAM(parameter), 0);
        MSG message;
        EXPECT_TRUE(waitUntil([&] {
            EXPECT_TRUE(IsWindow(page));
            if (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE))
                DispatchMessageW(&message);
            return !PropSheet_GetCurrentPageHwnd(sheet);
        })) << "the sheet ends";
        EXPECT_EQ(moduleRefCount(), 1);
        DestroyWindow(sheet);
        EXPECT_EQ(moduleRefCount(), 0) << end;
        EXPECT_FALSE(PeekMessageW(&message, nullptr, WM_QUIT, WM_QUIT, PM_REMOVE)) << "the thread goes on";
    }
}

TEST_F(PropertyPageTest, CountsUntilItsLastFrameHasReturned)
{
    const HWND owner = CreateWindowW(L"STATIC", L"", WS_POPUP, 0, 0, 9, 9, nullptr, nullptr, nullptr, nullptr);
    const HWND page = PropSheet_GetCurrentPageHwnd(openSheet(owner));
    std::thread host([&, thread = GetCurrentThreadId()] {
        waitDialog(L"Tavi Remote Backup");
        SendMessageW(owner, WM_CLOSE, 0, 0); // destroys the sheet
        EXPECT_EQ(moduleRefCount(), 1) << "the frames of the question";
        PostThreadMessageW(thread, WM_NULL, 0, 0); // wakes the question's message loop
    });
    SendMessageW(page, WM_COMMAND, TAVI_VERSIONS_RESTORE, 0);
    host.join();
    EXPECT_FALSE(IsWindow(page));
    EXPECT_EQ(moduleRefCount(), 0);
}

} // namespace
