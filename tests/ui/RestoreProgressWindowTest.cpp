#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Dialogs.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;

constexpr auto kStarted = EventType::restoreStarted, kEnded = EventType::restoreEnded, kItem = EventType::restoreItem,
               kTotal = EventType::restoreTotal, kDone = EventType::restoreDone;

struct RestoreProgressWindowTest : UiTest {
    // Queues a restore and returns the dialog, still hidden.
    static HWND open()
    {
        RestoreProgressWindow::getOrCreate();
        waitUntil([] { return RestoreProgressWindow::current()->dialog() != nullptr; });
        return RestoreProgressWindow::current()->dialog();
    }
    static bool shows(HWND dialog, const std::wstring& status)
    {
        return waitUntil([&] { return controlText(dialog, TAVI_PROGRESS_STATUS) == status; });
    }
    static bool closes(HWND dialog)
    {
        return waitUntil([&] { return !IsWindow(dialog); }) && !RestoreProgressWindow::current();
    }
};

TEST_F(RestoreProgressWindowTest, ShowsItselfLateAndFollowsRestoresToTheLastEnd)
{
    const DWORD start = GetTickCount();
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = open();
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    dispatch(event(kStarted));
    dispatch(event(kDone, 1 << 30)); // before the first item: not part of its speed
    dispatch(event(kTotal, 1000));
    dispatch(event(kItem, 0, "C:\\d\\A & B.txt"));
    EXPECT_TRUE(shows(dialog, L"C:\\d\\A & B.txt"));
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    dispatch(event(kDone, 500));
    const auto position = [&] { return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0); };
    EXPECT_TRUE(waitUntil([&] { return position() == 125; }));
    dispatch(event(kItem, 0, "C:\\d\\B.txt"));
    EXPECT_TRUE(waitUntil([] { return transferStatus().restoreSpeed() > 0; })) << "only the first item clears it";
    EXPECT_TRUE(waitUntil([&] { // the window's timer renews the rate
        return transferStatus().restoreRateLong = 1000, controlText(dialog, TAVI_PROGRESS_REMAINING) == L"4 seconds";
    }));
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    EXPECT_TRUE(waitUntil([&] { return controlText(dialog, TAVI_PROGRESS_REMAINING) == L"Unknown"; }));
    dispatch(event(kEnded));
    dispatch(event(kStarted));
    EXPECT_TRUE(shows(dialog, L"Finding file on server..."));
    EXPECT_EQ(position(), 125) << "until an amount moves it";
    // The dialog manager uses the number of the window's own message, too.
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    dispatch(event(kEnded));
    EXPECT_TRUE(closes(dialog));
}

TEST_F(RestoreProgressWindowTest, StaysRegisteredThoughItsDialogCannotBeCreated)
{
    setModuleInstance(GetModuleHandleW(L"kernel32.dll"));
    std::atomic<bool> hasLogged{false};
    log.onNextLine([&] { hasLogged = true; });
    RestoreProgressWindow::getOrCreate();
    EXPECT_TRUE(waitUntil([&] { return hasLogged.load(); }));
    dispatch(event(kItem, 0, "not shown"));
    EXPECT_EQ(moduleRefCount(), 2);
    // Posts WM_QUIT to its thread.
    std::thread([] { RestoreProgressWindow::current()->handleMessage(nullptr, WM_DESTROY, 0, 0); }).join();
    EXPECT_FALSE(RestoreProgressWindow::current());
    EXPECT_EQ(moduleRefCount()--, 1) << "the thread's stays raised";
}

// Instead of the dialog's window procedure: makes its thread wait.
WNDPROC procedure;
std::atomic<bool> isBusy;
LRESULT CALLBACK waitWhileBusy(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    waitUntil([] { return !isBusy; });
    return CallWindowProcW(procedure, window, message, wParam, lParam);
}

TEST_F(RestoreProgressWindowTest, HoldsFewMessagesWhileBusyAndCatchesUpInOneGo)
{
    translate("Finding file on server...", "Sucht die Datei...");
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = open();
    isBusy = true;
    procedure = reinterpret_cast<WNDPROC>(SetWindowLongPtrW(dialog, GWLP_WNDPROC, LONG_PTR(&waitWhileBusy)));
    dispatch(event(kEnded));
    const auto item = text(L"item");
    for (int round = 0; round < 50000; ++round)
        dispatch(std::make_unique<EventMessage>(round % 100 == 0 ? kStarted : kItem, 0, 0, 0, item));
    EXPECT_TRUE(item.use_count() > 1 && item.use_count() <= 1001) << item.use_count();
    dispatch(event(kStarted));
    isBusy = false;
    EXPECT_TRUE(shows(dialog, L"Sucht die Datei..."));
    dispatch(event(kEnded));
    EXPECT_TRUE(closes(dialog)) << "neither end was lost";
    EXPECT_TRUE(waitUntil([&] { return item.use_count() == 1; }));
}

TEST_F(RestoreProgressWindowTest, ClosesByEveryButtonThoughItCannotCancel)
{
    log.onNextLine([] { throw std::bad_alloc(); }); // the line that Cancel finds no service
    const std::tuple<UINT, WPARAM, std::size_t> cases[] = {
        {WM_COMMAND, TAVI_PROGRESS_CANCEL, 1}, {WM_COMMAND, TAVI_PROGRESS_CLOSE, 0}, {WM_CLOSE, 0, 0}};
    for (const auto& [message, command, lines] : cases) {
        const HWND dialog = open();
        dispatch(event(kStarted));
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(closes(dialog));
        EXPECT_EQ(log.take().size(), lines);
        EXPECT_TRUE(transferStatus().restoreStarted) << "the service goes on with the restore";
    }
}

TEST_F(RestoreProgressWindowTest, SurvivesRestoresThatStartEndAndCloseOnSeveralThreads)
{
    std::atomic<bool> done{false};
    std::thread ends([&] {
        for (int round = 0; !done; ++round)
            dispatch(event(round % 3 == 0 ? kEnded : kStarted));
    });
    const auto close = [] {
        if (const auto window = RestoreProgressWindow::current())
            PostMessageW(window->dialog(), WM_CLOSE, 0, 0);
        return moduleRefCount() == 0;
    };
    for (int restore = 0; restore < 300; ++restore, Sleep(1)) {
        RestoreProgressWindow::getOrCreate();
        if (restore % 3 == 2)
            close();
    }
    done = true;
    ends.join();
    EXPECT_TRUE(waitUntil(close));
}

} // namespace
} // namespace tavi
