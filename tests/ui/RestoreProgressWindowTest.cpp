#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"
#include "ui/resource.h"

using namespace tavi;

namespace {

using namespace test;

constexpr auto kStarted = EventType::restoreStarted, kEnded = EventType::restoreEnded, kItem = EventType::restoreItem,
               kTotal = EventType::restoreTotal, kDone = EventType::restoreDone;

// Instead of the dialog's procedure: counts its messages, and makes the thread wait or its timer stop.
WNDPROC procedure;
std::atomic<bool> isBusy, isStopped;
std::atomic<unsigned> ticks, notifications;
LRESULT CALLBACK spy(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    waitUntil([] { return !isBusy; });
    notifications += message == WM_USER + 1 ? 1 : 0;
    if (message == WM_TIMER) {
        if (isStopped)
            return 0;
        ++ticks;
    }
    return CallWindowProcW(procedure, window, message, wParam, lParam);
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
    bool shows(const std::wstring& text) const
    {
        return waitUntil([&] { return controlText(dialog, TAVI_PROGRESS_STATUS) == text; });
    }
    bool reaches(LRESULT position) const
    {
        return waitUntil([&] { return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0) == position; });
    }
    bool closes() const
    {
        return waitUntil([&] { return !IsWindow(dialog); }) && !RestoreProgressWindow::current();
    }
    bool ends() const
    {
        dispatch(event(kEnded));
        return closes();
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
    dispatch(event(kStarted));
    EXPECT_TRUE(shows(L"Finding file on server..."));
    dispatch(event(kDone, 1 << 30)); // before the first item: not part of its speed
    const RateRing& ring = transferStatus().restoreRing;
    EXPECT_TRUE(waitUntil([&] { return ring.rateOver(60000) > 0; }));
    dispatch(event(kItem, 0, "A"));
    EXPECT_EQ(ring.rateOver(60000), 0);
    dispatch(event(kTotal, 1000));
    dispatch(event(kDone, 500));
    dispatch(event(kItem, 0, "C:\\d\\A & B.txt"));
    EXPECT_TRUE(waitUntil([&] { return ring.rateOver(60000) > 0; })) << "only the first item clears it";
    EXPECT_TRUE(shows(L"C:\\d\\A & B.txt"));
    EXPECT_TRUE(reaches(125));
    // The dialog manager uses the number of the window's own message, too.
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    EXPECT_TRUE(waitUntil([] { return ticks >= 8; }));
    EXPECT_LE(ticks, (GetTickCount() - start) / 250 + 2);
    dispatch(event(kEnded));
    dispatch(event(kStarted));
    EXPECT_TRUE(shows(L"Finding file on server..."));
    EXPECT_TRUE(reaches(125)) << "until an amount moves it";
    EXPECT_TRUE(ends());
}

TEST_F(RestoreProgressWindowTest, RefreshesForAStartAnEndAndASnapshotOnly)
{
    open(2);
    EXPECT_TRUE(shows(L"Waiting to begin restore..."));
    isStopped = true;
    // A message, and whether it refreshes the first line.
    std::pair<std::unique_ptr<PipeMessage>, bool> cases[] = {
        {event(kItem, 0, "not before the next refresh"), false},
        {event(kDone, 1), false},
        {std::make_unique<CounterMessage>(1, 1, 1, 1), false},
        {event(EventType::snapshot), false}, // no snapshot: its kind decides
        {std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0), true},
        {event(kStarted), true},
        {event(kEnded), true},
    };
    for (auto& [message, refreshes] : cases) {
        SetDlgItemTextW(dialog, TAVI_PROGRESS_STATUS, L"?");
        const EventType type = message->type();
        dispatch(std::move(message));
        SendMessageW(dialog, WM_NULL, 0, 0); // after the notification
        EXPECT_NE(controlText(dialog, TAVI_PROGRESS_STATUS) == L"?", refreshes) << static_cast<std::uint32_t>(type);
    }
    EXPECT_TRUE(ends());
}

TEST_F(RestoreProgressWindowTest, CatchesUpAfterOneNotificationOrNone)
{
    translate("Finding file on server...", "Sucht die Datei...");
    open(3);
    isBusy = true;
    for (const EventType type : {kEnded, kStarted, kItem, kEnded, kStarted})
        dispatch(event(type));
    isBusy = false;
    EXPECT_TRUE(shows(L"Sucht die Datei..."));
    EXPECT_EQ(notifications, 1u);
    // The next one is lost, as if the dialog were this one, which does not exist.
    RestoreProgressWindow::current()->handleMessage(reinterpret_cast<HWND>(LONG_PTR{0x7FFE}), WM_INITDIALOG, 0, 0);
    EXPECT_TRUE(ends()) << "no end was lost";
}

TEST_F(RestoreProgressWindowTest, HidesBeforeItWaitsForAServiceThatDoesNotRead)
{
    const PipeServer deaf(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
    open();
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    click(dialog, TAVI_PROGRESS_CANCEL);
    EXPECT_TRUE(deaf.waitClient());
    EXPECT_TRUE(IsWindow(dialog)) << "it waits";
    EXPECT_FALSE(IsWindowVisible(dialog));
    EXPECT_FALSE(RestoreProgressWindow::current()) << "the next restore has a new window";
    deaf.hangUp();
    EXPECT_TRUE(closes());
}

TEST_F(RestoreProgressWindowTest, ClosesAtOnceByEveryButtonThoughItCannotCancel)
{
    log.onNextLine([] { throw std::bad_alloc(); }); // the line that Cancel finds no service
    const std::tuple<UINT, WPARAM, std::size_t> cases[] = {
        {WM_COMMAND, TAVI_PROGRESS_CANCEL, 1}, {WM_COMMAND, TAVI_PROGRESS_CLOSE, 0}, {WM_CLOSE, 0, 0}};
    for (const auto& [message, command, lines] : cases) {
        open(2);
        dispatch(event(kStarted));
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(closes()) << "though two restores hold it";
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
