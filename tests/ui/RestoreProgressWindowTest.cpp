#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"
#include "tests/support/Counts.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;

// In place of a window's procedure: counts its notifications, and makes its thread wait while told so.
constexpr UINT kWait = WM_APP + 1;
WNDPROC procedure;
std::atomic<int> notified;
std::atomic<bool> waits;
LRESULT CALLBACK watch(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    notified += message == WM_USER + 1 && lParam ? 1 : 0;
    if (message == kWait)
        waits = true;
    waitUntil([] { return !waits; });
    return CallWindowProcW(procedure, window, message, wParam, lParam);
}

struct RestoreProgressWindowTest : UiTest {
    RestoreProgressWindowTest()
    {
        tell(EventType::restoreEnded);
    }
    static void tell(EventType type, std::uint64_t value = 0, const wxString& item = wxString())
    {
        dispatch(event(type, value, item));
    }
    // Asks for the window and returns it still hidden.
    static HWND opened()
    {
        RestoreProgressWindow::getOrCreate();
        waitUntil([] { return RestoreProgressWindow::current()->dialog() != nullptr; });
        return RestoreProgressWindow::current()->dialog();
    }
    static void shows(HWND dialog, int control, const std::wstring& content)
    {
        EXPECT_TRUE(waitUntil([&] { return controlText(dialog, control) == content; })) << wxString(content);
    }
    static bool gone(HWND dialog)
    {
        return waitUntil([&] { return !IsWindow(dialog); }) && !RestoreProgressWindow::current();
    }
};

TEST_F(RestoreProgressWindowTest, FollowsARestoreToItsEnd)
{
    const DWORD start = GetTickCount();
    const HWND dialog = opened();
    EXPECT_EQ(moduleRefCount(), 2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CLOSE);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Waiting to begin restore...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");
    shows(dialog, TAVI_PROGRESS_SPEED, L"0.0 b/s");
    tell(EventType::restoreStarted);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    tell(EventType::restoreDone, 1 << 30); // found before the first item: not part of its speed
    tell(EventType::restoreTotal, 1000);
    tell(EventType::restoreItem, 0, "C:\\d\\A & B.txt");
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\A & B.txt");
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    tell(EventType::restoreDone, 500);
    const auto position = [&] { return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0); };
    EXPECT_TRUE(waitUntil([&] { return position() == 125; }));
    tell(EventType::restoreItem, 0, "C:\\d\\B.txt");
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\B.txt");
    EXPECT_TRUE(waitUntil([&] { return transferStatus().restoreSpeed() > 0; })) << "only the first item clears it";
    transferStatus().restoreRateLong = 1000;
    shows(dialog, TAVI_PROGRESS_REMAINING, L"4 seconds");
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");

    // A second restore joins; its start leaves the bar where it is until an amount moves it.
    RestoreProgressWindow::getOrCreate();
    tell(EventType::restoreItem, 0, "last");
    shows(dialog, TAVI_PROGRESS_STATUS, L"last");
    tell(EventType::restoreEnded);
    tell(EventType::restoreStarted);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    EXPECT_EQ(position(), 125);
    // Others know the message number too.
    SendMessageW(dialog, WM_USER + 1, 0, 0x1234);
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    tell(EventType::restoreEnded);
    EXPECT_TRUE(gone(dialog));
}

// Without a dialog nothing handles messages; the object stays for the restores that hold it.
TEST_F(RestoreProgressWindowTest, StaysRegisteredThoughItsDialogCannotBeMade)
{
    setModuleInstance(GetModuleHandleW(L"kernel32.dll"));
    const std::size_t before = countThreads();
    RestoreProgressWindow::getOrCreate();
    EXPECT_TRUE(waitUntil([&] { return countThreads() == before; }));
    EXPECT_EQ(log.take().size(), 1u);
    const auto item = text(L"item");
    dispatch(std::make_unique<EventMessage>(EventType::restoreItem, 0, 0, 0, item));
    EXPECT_EQ(item.use_count(), 1);
    EXPECT_EQ(moduleRefCount(), 2);
    RestoreProgressWindow::current()->handleMessage(nullptr, WM_DESTROY, 0, 0);
    EXPECT_FALSE(RestoreProgressWindow::current());
    EXPECT_EQ(moduleRefCount()--, 1) << "the thread's stays raised";
}

TEST_F(RestoreProgressWindowTest, HoldsFewMessagesWhileNobodyReadsItsCancel)
{
    const PipeServer server(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
    const HWND dialog = opened();
    PostMessageW(dialog, WM_COMMAND, TAVI_PROGRESS_CANCEL, 0);
    ASSERT_TRUE(server.waitClient());
    const auto item = text(L"item");
    for (int round = 0; round < 50000; ++round)
        dispatch(std::make_unique<EventMessage>(round % 100 == 0 ? EventType::restoreStarted : EventType::restoreItem,
                                                0, 0, 0, item));
    EXPECT_GT(item.use_count(), 1) << "it is stuck in its write";
    EXPECT_LE(item.use_count(), 1001);
    server.hangUp();
    EXPECT_TRUE(gone(dialog));
    EXPECT_TRUE(waitUntil([&] { return item.use_count() == 1; }));
    EXPECT_TRUE(log.take().empty());
}

TEST_F(RestoreProgressWindowTest, CatchesUpInOneGoAfterItWasBusy)
{
    translate("Finding file on server...", "Sucht die Datei...");
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = opened();
    notified = 0;
    procedure = reinterpret_cast<WNDPROC>(SetWindowLongPtrW(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(&watch)));
    SendNotifyMessageW(dialog, kWait, 0, 0);
    ASSERT_TRUE(waitUntil([] { return waits.load(); }));
    tell(EventType::restoreEnded);
    for (int round = 0; round < 5000; ++round)
        tell(EventType::restoreDone, 1);
    tell(EventType::restoreStarted);
    waits = false;
    shows(dialog, TAVI_PROGRESS_STATUS, L"Sucht die Datei...");
    EXPECT_EQ(notified, 1);
    {
        const auto last = RestoreProgressWindow::current();
        tell(EventType::restoreEnded);
        SendMessageW(dialog, WM_NULL, 0, 0); // it has handled the end
        EXPECT_EQ(last->dialog(), dialog);
    }
    EXPECT_TRUE(gone(dialog)) << "neither end was lost, and another thread dropped the last reference";
}

TEST_F(RestoreProgressWindowTest, ButtonsCloseItAtOnceAndOnlyCancelCancels)
{
    // Each line that reports a missing service throws.
    const std::function<void()> fail = [&] {
        log.onNextLine(fail);
        throw std::bad_alloc();
    };
    log.onNextLine(fail);
    const std::tuple<UINT, WPARAM, bool> cases[] = {{WM_COMMAND, TAVI_PROGRESS_CANCEL, true},
                                                    {WM_COMMAND, TAVI_PROGRESS_CANCEL, false},
                                                    {WM_COMMAND, TAVI_PROGRESS_CLOSE, true},
                                                    {WM_CLOSE, 0, true}};
    for (const auto& [message, command, serviceRuns] : cases) {
        std::optional<PipeServer> server;
        if (serviceRuns)
            server.emplace(kCommand, DWORD{PIPE_ACCESS_INBOUND});
        RestoreProgressWindow::getOrCreate();
        const HWND dialog = opened();
        tell(EventType::restoreStarted);
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(gone(dialog));
        EXPECT_EQ(log.take().size(), serviceRuns ? 0u : 2u);
        EXPECT_TRUE(transferStatus().restoreStarted);
        tell(EventType::restoreItem, 0, "later"); // nobody is there to take it
        if (server && command == TAVI_PROGRESS_CANCEL) {
            EXPECT_EQ(server->readAll(), serialised(*event(EventType::restoreEnded)));
        } else if (server) {
            EXPECT_TRUE(WaitNamedPipeW(kCommand, 1)) << "nobody has come";
        }
    }
    log.onNextLine(nullptr);
}

// Restores that are asked for, end and are closed on several threads at once.
TEST_F(RestoreProgressWindowTest, SurvivesEveryOrderOfEnds)
{
    const auto close = [] {
        if (const auto window = RestoreProgressWindow::current())
            PostMessageW(window->dialog(), WM_CLOSE, 0, 0);
        return moduleRefCount() == 0;
    };
    std::atomic<bool> done{false};
    std::thread ends([&] {
        for (int round = 0; round < 3000; ++round)
            tell(round % 3 == 0 ? EventType::restoreEnded : EventType::restoreStarted);
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
