#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Counts.h"
#include "tests/support/Pipes.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;

constexpr auto kStarted = EventType::restoreStarted, kEnded = EventType::restoreEnded, kItem = EventType::restoreItem,
               kTotal = EventType::restoreTotal, kDone = EventType::restoreDone;

struct RestoreProgressWindowTest : UiTest {
    RestoreProgressWindowTest()
    {
        tell(kEnded);
    }
    static void tell(EventType type, std::uint64_t value = 0, const wxString& item = wxString())
    {
        dispatch(event(type, value, item));
    }
    // Queues a restore and returns the dialog, still hidden.
    static HWND open()
    {
        RestoreProgressWindow::getOrCreate();
        waitUntil([] { return RestoreProgressWindow::current()->dialog() != nullptr; });
        return RestoreProgressWindow::current()->dialog();
    }
    static void shows(HWND dialog, int control, const std::wstring& content)
    {
        EXPECT_TRUE(waitUntil([&] { return controlText(dialog, control) == content; })) << wxString(content);
    }
    static LRESULT position(HWND dialog)
    {
        return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0);
    }
    static bool closes(HWND dialog)
    {
        return waitUntil([&] { return !IsWindow(dialog); }) && !RestoreProgressWindow::current();
    }
};

TEST_F(RestoreProgressWindowTest, ShowsItselfLateAndFollowsARestore)
{
    const DWORD start = GetTickCount();
    const HWND dialog = open();
    EXPECT_EQ(moduleRefCount(), 2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Waiting to begin restore...");
    shows(dialog, TAVI_PROGRESS_SPEED, L"0.0 b/s");
    tell(kStarted);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    tell(kDone, 1 << 30); // before the first item: not part of its speed
    tell(kTotal, 1000);
    tell(kItem, 0, "C:\\d\\A & B.txt");
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\A & B.txt");
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    tell(kDone, 500);
    EXPECT_TRUE(waitUntil([&] { return position(dialog) == 125; }));
    tell(kItem, 0, "C:\\d\\B.txt");
    EXPECT_TRUE(waitUntil([&] { return transferStatus().restoreSpeed() > 0; })) << "only the first item clears it";
    transferStatus().restoreRateLong = 1000;
    shows(dialog, TAVI_PROGRESS_REMAINING, L"4 seconds");
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");
    tell(kEnded);
    EXPECT_TRUE(closes(dialog));
}

TEST_F(RestoreProgressWindowTest, ServesASecondRestoreAndEndsWithTheLast)
{
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = open();
    tell(kTotal, 1000);
    tell(kDone, 500);
    EXPECT_TRUE(waitUntil([&] { return position(dialog) == 125; }));
    tell(kItem, 0, "last");
    shows(dialog, TAVI_PROGRESS_STATUS, L"last");
    tell(kEnded);
    tell(kStarted);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    EXPECT_EQ(position(dialog), 125) << "until an amount moves it";
    // The dialog manager uses the number of the window's own message, too.
    SendMessageW(dialog, WM_USER + 1, 0, 0x1234);
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    tell(kEnded);
    EXPECT_TRUE(closes(dialog));
}

TEST_F(RestoreProgressWindowTest, StaysRegisteredThoughItsDialogCannotBeCreated)
{
    setModuleInstance(GetModuleHandleW(L"kernel32.dll"));
    const std::size_t before = countThreads();
    RestoreProgressWindow::getOrCreate();
    EXPECT_TRUE(waitUntil([&] { return countThreads() == before; }));
    EXPECT_EQ(log.take().size(), 1u);
    const auto item = text(L"item");
    dispatch(std::make_unique<EventMessage>(kItem, 0, 0, 0, item));
    EXPECT_EQ(item.use_count(), 1) << "a message that nothing can handle";
    EXPECT_EQ(moduleRefCount(), 2);
    RestoreProgressWindow::current()->handleMessage(nullptr, WM_DESTROY, 0, 0);
    EXPECT_FALSE(RestoreProgressWindow::current());
    EXPECT_EQ(moduleRefCount()--, 1) << "the thread's stays raised";
}

// Instead of the dialog's window procedure: counts notifications and, when told so, keeps its thread busy.
constexpr UINT kBeBusy = WM_APP + 1;
WNDPROC procedure;
std::atomic<int> notified;
std::atomic<bool> isBusy;
LRESULT CALLBACK watch(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    notified += message == WM_USER + 1 && lParam ? 1 : 0;
    if (message == kBeBusy)
        isBusy = true;
    waitUntil([] { return !isBusy; });
    return CallWindowProcW(procedure, window, message, wParam, lParam);
}

TEST_F(RestoreProgressWindowTest, HoldsFewMessagesWhileBusyAndCatchesUpInOneGo)
{
    translate("Finding file on server...", "Sucht die Datei...");
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = open();
    notified = 0;
    procedure = reinterpret_cast<WNDPROC>(SetWindowLongPtrW(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(&watch)));
    SendNotifyMessageW(dialog, kBeBusy, 0, 0);
    ASSERT_TRUE(waitUntil([] { return isBusy.load(); }));
    tell(kEnded);
    const auto item = text(L"item");
    for (int round = 0; round < 50000; ++round)
        dispatch(std::make_unique<EventMessage>(round % 100 == 0 ? kStarted : kItem, 0, 0, 0, item));
    EXPECT_TRUE(item.use_count() > 1 && item.use_count() <= 1001) << item.use_count();
    tell(kStarted);
    isBusy = false;
    shows(dialog, TAVI_PROGRESS_STATUS, L"Sucht die Datei...");
    EXPECT_EQ(notified, 1);
    tell(kEnded);
    EXPECT_TRUE(closes(dialog)) << "neither end was lost";
    EXPECT_TRUE(waitUntil([&] { return item.use_count() == 1; }));
}

TEST_F(RestoreProgressWindowTest, ClosesByItsButtonsAndCancelsByOneOfThem)
{
    // Each line that reports a missing service throws.
    const std::function<void()> fail = [&] {
        log.onNextLine(fail);
        throw std::bad_alloc();
    };
    log.onNextLine(fail);
    const std::tuple<const char*, UINT, WPARAM, bool> cases[] = {
        {"Cancel", WM_COMMAND, TAVI_PROGRESS_CANCEL, true},
        {"Cancel without a service", WM_COMMAND, TAVI_PROGRESS_CANCEL, false},
        {"Close", WM_COMMAND, TAVI_PROGRESS_CLOSE, true},
        {"the caption's button", WM_CLOSE, 0, true}};
    for (const auto& [label, message, command, serviceRuns] : cases) {
        SCOPED_TRACE(label);
        std::optional<PipeServer> server;
        if (serviceRuns)
            server.emplace(kCommand, DWORD{PIPE_ACCESS_INBOUND});
        RestoreProgressWindow::getOrCreate();
        const HWND dialog = open();
        tell(kStarted);
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(closes(dialog));
        EXPECT_EQ(log.take().size(), serviceRuns ? 0u : 2u);
        EXPECT_TRUE(transferStatus().restoreStarted);
        tell(kItem, 0, "later");
        if (server && command == TAVI_PROGRESS_CANCEL) {
            EXPECT_EQ(server->readAll(), serialised(*event(kEnded)));
        } else if (server) {
            EXPECT_TRUE(WaitNamedPipeW(kCommand, 1)) << "no client has connected";
        }
    }
    log.onNextLine(nullptr);
}

TEST_F(RestoreProgressWindowTest, SurvivesRestoresThatStartEndAndCloseOnSeveralThreads)
{
    const auto close = [] {
        if (const auto window = RestoreProgressWindow::current())
            PostMessageW(window->dialog(), WM_CLOSE, 0, 0);
        return moduleRefCount() == 0;
    };
    std::atomic<bool> done{false};
    std::thread ends([&] {
        for (int round = 0; round < 3000; ++round)
            tell(round % 3 == 0 ? kEnded : kStarted);
        done = true;
    });
    for (int round = 0; !done; ++round) {
        RestoreProgressWindow::getOrCreate();
        Sleep(1);
        if (round % 3 == 0)
            close();
    }
    ends.join();
    EXPECT_TRUE(waitUntil(close));
}

} // namespace
} // namespace tavi
