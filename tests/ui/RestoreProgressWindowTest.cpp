#include "ui/RestoreProgressWindow.h"

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"
#include "ui/resource.h"

using namespace tavi;

namespace {

using namespace test;

constexpr auto kStarted = EventType::restoreStarted, kEnded = EventType::restoreEnded, kItem = EventType::restoreItem;

// Instead of the dialog's procedure: counts its messages, and makes the thread wait or its timer stop.
WNDPROC procedure;
std::atomic<bool> isBusy, isStopped;
std::atomic<unsigned> ticks, notifications;
LRESULT CALLBACK spy(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    waitUntil([] { return !isBusy; });
    notifications += message == WM_USER + 1 ? 1 : 0;
    ticks += message == WM_TIMER ? 1 : 0;
    return message == WM_TIMER && isStopped ? 0 : CallWindowProcW(procedure, window, message, wParam, lParam);
}

struct RestoreProgressWindowTest : UiTest {
    // Queues restores and waits for the dialog, still hidden.
    void open(int restores = 1)
    {
        transferStatus().resetRestore();
        for (int i = 0; i < restores; ++i)
            RestoreProgressWindow::getOrCreate();
        waitUntil([] { return RestoreProgressWindow::current()->dialog() != nullptr; });
        dialog = RestoreProgressWindow::current()->dialog();
        isBusy = isStopped = false;
        ticks = notifications = 0;
        procedure = reinterpret_cast<WNDPROC>(GetWindowLongPtrW(dialog, GWLP_WNDPROC));
        SetWindowLongPtrW(dialog, GWLP_WNDPROC, LONG_PTR(&spy));
    }
    bool shows(const std::wstring& text, int control = TAVI_PROGRESS_STATUS) const
    {
        return waitUntil([&] { return controlText(dialog, control) == text; });
    }
    bool closes() const
    {
        return waitUntil([&] { return !IsWindow(dialog); }) && !RestoreProgressWindow::current();
    }
    HWND dialog = nullptr;
};

TEST_F(RestoreProgressWindowTest, ShowsItselfLateAndTheStatusOfEachRestoreUntilTheLastEnd)
{
    const DWORD start = GetTickCount();
    open(2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    EXPECT_TRUE(shows(L"Waiting to begin restore..."));
    EXPECT_TRUE(shows(L"Unknown", TAVI_PROGRESS_REMAINING));
    EXPECT_TRUE(shows(L"0.0 b/s", TAVI_PROGRESS_SPEED));
    dispatch(event(kStarted));
    EXPECT_TRUE(shows(L"Finding file on server..."));
    dispatch(event(EventType::restoreDone, 1 << 30)); // before the first item: not part of its speed
    const RateRing& ring = transferStatus().restoreRing;
    EXPECT_TRUE(waitUntil([&] { return ring.rateOver(60000) > 0; }));
    dispatch(event(kItem, 0, "A"));
    EXPECT_EQ(ring.rateOver(60000), 0);
    dispatch(event(EventType::restoreTotal, 1 << 30));
    dispatch(event(EventType::restoreDone, 1 << 29));
    dispatch(event(kItem, 0, "C:\\d\\A & B.txt"));
    EXPECT_TRUE(waitUntil([&] { return ring.rateOver(60000) > 0; })) << "only the first item clears it";
    EXPECT_TRUE(shows(L"C:\\d\\A & B.txt"));
    const auto position = [&] { return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0); };
    EXPECT_EQ(position(), 125);
    // The dialog manager uses the number of the window's own message, too.
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    EXPECT_TRUE(waitUntil([&] {
        dispatch(event(EventType::restoreDone, 1)); // never a silence that outlasts the speed
        transferStatus().restoreRateLong = 1000;    // as after ten seconds
        return ticks >= 8 && controlText(dialog, TAVI_PROGRESS_SPEED) != L"0.0 b/s" &&
               controlText(dialog, TAVI_PROGRESS_REMAINING) == L"49 days, 17 hours";
    }));
    EXPECT_LE(ticks, (GetTickCount() - start) / 250 + 2);
    dispatch(event(kEnded));
    dispatch(event(kStarted));
    EXPECT_TRUE(shows(L"Finding file on server..."));
    EXPECT_EQ(position(), 125) << "until an amount moves it";
    dispatch(event(kEnded));
    EXPECT_TRUE(closes());
}

TEST_F(RestoreProgressWindowTest, RefreshesForAStartAnEndAndASnapshotOnly)
{
    open(2);
    EXPECT_TRUE(shows(L"Waiting to begin restore..."));
    isStopped = true;
    // A message, and whether it refreshes the first line.
    const std::pair<std::unique_ptr<PipeMessage>, bool> cases[] = {
        {event(kItem, 0, "not before the next refresh"), false},
        {std::make_unique<CounterMessage>(1, 1, 1, 1), false},
        {event(EventType::snapshot), false}, // no snapshot: its kind decides
        {std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0), true},
        {event(kStarted), true},
        {event(kEnded), true},
    };
    for (const auto& [message, refreshes] : cases) {
        SetDlgItemTextW(dialog, TAVI_PROGRESS_STATUS, L"?");
        dispatch(message->clone());
        SendMessageW(dialog, WM_NULL, 0, 0); // after the notification
        EXPECT_NE(controlText(dialog, TAVI_PROGRESS_STATUS) == L"?", refreshes) << unsigned(message->type());
    }
    dispatch(event(kEnded));
    EXPECT_TRUE(closes());
}

TEST_F(RestoreProgressWindowTest, CatchesUpAfterOneNotificationOrNone)
{
    open(3);
    isBusy = true;
    for (const EventType type : {kEnded, kStarted, kItem, kEnded, kStarted})
        dispatch(event(type));
    isBusy = false;
    EXPECT_TRUE(shows(L"Finding file on server..."));
    EXPECT_EQ(notifications, 1u);
    // The next one is lost, as if the dialog were this one, which does not exist.
    RestoreProgressWindow::current()->handleMessage(reinterpret_cast<HWND>(LONG_PTR{0x7FFE}), WM_INITDIALOG, 0, 0);
    dispatch(event(kEnded));
    EXPECT_TRUE(closes()) << "no end was lost";
}

TEST_F(RestoreProgressWindowTest, HidesBeforeItWaitsForAServiceThatDoesNotRead)
{
    const PipeServer deaf(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
    open();
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    click(dialog, TAVI_PROGRESS_CANCEL);
    EXPECT_TRUE(deaf.waitClient());
    EXPECT_FALSE(IsWindowVisible(dialog));
    EXPECT_FALSE(RestoreProgressWindow::current());
    const HWND first = dialog;
    open();
    deaf.hangUp();
    EXPECT_TRUE(waitUntil([&] { return !IsWindow(first); }));
    EXPECT_TRUE(RestoreProgressWindow::current()) << "the next restore has its own window";
    dispatch(event(kEnded));
    EXPECT_TRUE(closes());
}

TEST_F(RestoreProgressWindowTest, ClosesAtOnceByEveryButtonThoughItCannotCancel)
{
    log.onNextLine([] { throw std::bad_alloc(); });
    const std::tuple<UINT, WPARAM, std::string> cases[] = {
        {WM_COMMAND, TAVI_PROGRESS_CANCEL, "1: Error: Unable to open command pipe: 2"},
        {WM_COMMAND, TAVI_PROGRESS_CLOSE, ""},
        {WM_CLOSE, 0, ""}};
    for (const auto& [message, command, line] : cases) {
        open(2);
        dispatch(event(kStarted));
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(closes()) << "though two restores hold it";
        EXPECT_EQ(log.takeText(), line);
        EXPECT_TRUE(transferStatus().restoreStarted) << "the service goes on with the restore";
    }
}

} // namespace
