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

constexpr const wchar_t* kCommand = L"\\\\.\\pipe\\tavibackup";

// Counts what a window is sent, and makes its thread wait.
struct Watch {
    static constexpr UINT kWait = WM_APP + 1;
    static inline WNDPROC procedure;
    static inline std::atomic<int> shown, notified;
    static inline std::atomic<bool> waits;
    explicit Watch(HWND dialog)
    {
        shown = notified = 0;
        procedure = reinterpret_cast<WNDPROC>(
            SetWindowLongPtrW(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(&Watch::handle)));
    }
    static LRESULT CALLBACK handle(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
    {
        shown += message == WM_SHOWWINDOW && wParam ? 1 : 0;
        notified += message == WM_USER + 1 && lParam ? 1 : 0;
        if (message == kWait)
            waits = true, waitUntil([] { return !waits; });
        return CallWindowProcW(procedure, window, message, wParam, lParam);
    }
};

struct RestoreProgressWindowTest : UiTest {
    RestoreProgressWindowTest()
    {
        dispatch(std::make_unique<EventMessage>(52));
    }
    static void tell(std::uint32_t type, std::uint64_t value = 0, const MessageText& item = text(L""))
    {
        dispatch(std::make_unique<EventMessage>(type, 0, value, 0, item));
    }
    // Asks for the window and returns it still hidden.
    static HWND opened()
    {
        RestoreProgressWindow::getOrCreate();
        HWND dialog = nullptr;
        waitUntil([&] {
            const auto window = RestoreProgressWindow::current();
            dialog = window ? window->dialog() : nullptr;
            return dialog != nullptr;
        });
        return dialog;
    }
    static void shows(HWND dialog, int control, const std::wstring& content)
    {
        waitUntil([&] { return controlText(dialog, control) == content; });
        EXPECT_EQ(controlText(dialog, control), content);
    }
    static LRESULT position(HWND dialog)
    {
        return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0);
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
    const Watch watch(dialog);
    EXPECT_FALSE(IsWindowVisible(dialog));
    EXPECT_EQ(moduleRefCount(), 2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    EXPECT_EQ(watch.shown, 1);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CLOSE);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Waiting to begin restore...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");
    shows(dialog, TAVI_PROGRESS_SPEED, L"0.0 b/s");
    tell(51);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    tell(56, 1 << 30); // found before the first item: not part of its speed
    tell(53, 1000);
    tell(54, 0, text(L"C:\\d\\A & B.txt"));
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\A & B.txt");
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    tell(56, 500);
    EXPECT_TRUE(waitUntil([&] { return position(dialog) == 125; }));
    tell(54, 0, text(L"C:\\d\\B.txt"));
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\B.txt");
    EXPECT_TRUE(waitUntil([&] { return transferStatus().restoreSpeed() > 0; })) << "only the first item clears it";
    transferStatus().restoreRateLong = 1000;
    shows(dialog, TAVI_PROGRESS_REMAINING, L"4 seconds");
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");

    // A second restore joins; its start leaves the bar where it is until an amount moves it.
    RestoreProgressWindow::getOrCreate();
    tell(54, 0, text(L"last"));
    shows(dialog, TAVI_PROGRESS_STATUS, L"last");
    tell(52);
    tell(51);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    EXPECT_EQ(position(dialog), 125);
    EXPECT_TRUE(IsWindow(dialog));
    // Others know the message number too.
    SendMessageW(dialog, WM_USER + 1, 0, 0x1234);
    SendMessageW(dialog, WM_APP, 0, 0);
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    tell(52);
    EXPECT_TRUE(gone(dialog));
}

TEST_F(RestoreProgressWindowTest, EndsUnseenWhenTheRestoreIsQuick)
{
    const DWORD start = GetTickCount();
    const HWND dialog = opened();
    const Watch watch(dialog);
    const bool hidden = !IsWindowVisible(dialog);
    tell(51);
    Sleep(300); // a tick of its timer
    tell(52);
    EXPECT_TRUE(gone(dialog));
    EXPECT_TRUE((hidden && watch.shown == 0) || GetTickCount() - start >= 500) << "a busy machine may be slower";
    EXPECT_FALSE(transferStatus().restoreStarted);
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
    tell(54, 0, item);
    EXPECT_EQ(item.use_count(), 1);
    EXPECT_EQ(moduleRefCount(), 2);
    RestoreProgressWindow::current()->handleMessage(nullptr, WM_DESTROY, 0, 0);
    EXPECT_FALSE(RestoreProgressWindow::current());
    EXPECT_EQ(moduleRefCount()--, 1) << "the thread's stays raised";
}

TEST_F(RestoreProgressWindowTest, HoldsFewMessagesWhileNobodyReadsItsCancel)
{
    for (const bool reads : {true, false}) {
        const PipeServer server(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
        const HWND dialog = opened();
        PostMessageW(dialog, WM_COMMAND, TAVI_PROGRESS_CANCEL, 0);
        ASSERT_TRUE(server.waitClient());
        const auto item = text(L"item");
        for (int round = 0; round < 50000; ++round)
            tell(round % 100 == 0 ? 51 : 54, 0, item);
        EXPECT_GT(item.use_count(), 1) << "it is stuck in its write";
        EXPECT_LE(item.use_count(), 1001);
        reads ? static_cast<void>(server.readAll()) : server.hangUp();
        EXPECT_TRUE(gone(dialog));
        EXPECT_TRUE(waitUntil([&] { return item.use_count() == 1; }));
    }
    EXPECT_TRUE(log.take().empty());
}

TEST_F(RestoreProgressWindowTest, CatchesUpInOneGoAfterItWasBusy)
{
    translate("Finding file on server...", "Sucht die Datei...");
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = opened();
    const Watch watch(dialog);
    SendNotifyMessageW(dialog, Watch::kWait, 0, 0);
    ASSERT_TRUE(waitUntil([] { return Watch::waits.load(); }));
    tell(52);
    for (int round = 0; round < 5000; ++round)
        tell(56, 1);
    tell(51);
    watch.waits = false;
    shows(dialog, TAVI_PROGRESS_STATUS, L"Sucht die Datei...");
    EXPECT_EQ(watch.notified, 1);
    {
        const auto last = RestoreProgressWindow::current();
        tell(52);
        SendMessageW(dialog, WM_NULL, 0, 0); // it has handled the end
        EXPECT_EQ(last->dialog(), dialog);
    }
    EXPECT_TRUE(gone(dialog)) << "neither end was lost, and another thread dropped the last reference";
}

TEST_F(RestoreProgressWindowTest, ButtonsCloseItAtOnceAndOnlyCancelCancels)
{
    const struct {
        UINT message;
        WPARAM command;
        bool serviceRuns;
        const char* received;
    } cases[] = {{WM_COMMAND, TAVI_PROGRESS_CANCEL, true, "3400000014000000"},
                 {WM_COMMAND, TAVI_PROGRESS_CANCEL, false, nullptr},
                 {WM_COMMAND, TAVI_PROGRESS_CLOSE, true, nullptr},
                 {WM_CLOSE, 0, true, nullptr}};
    for (const auto& test : cases) {
        // Throws where a missing service is reported.
        struct FailingLog : wxLog {
            int lines = 0;
            void DoLogTextAtLevel(wxLogLevel, const wxString&) override
            {
                ++lines;
                throw std::bad_alloc();
            }
        } failing;
        std::optional<PipeServer> server;
        if (test.serviceRuns)
            server.emplace(kCommand, DWORD{PIPE_ACCESS_INBOUND});
        RestoreProgressWindow::getOrCreate();
        const HWND dialog = opened();
        tell(51);
        wxLog* const before = wxLog::SetActiveTarget(&failing);
        PostMessageW(dialog, test.message, test.command, 0);
        EXPECT_TRUE(gone(dialog));
        wxLog::SetActiveTarget(before);
        EXPECT_EQ(failing.lines, test.serviceRuns ? 0 : 2);
        EXPECT_TRUE(transferStatus().restoreStarted);
        tell(54, 0, text(L"later")); // nobody is there to take it
        if (test.received) {
            EXPECT_EQ(hex(server->readAll()), test.received + std::string(40, '0'));
        } else if (server) {
            EXPECT_TRUE(WaitNamedPipeW(kCommand, 1)) << "nobody has come";
        }
    }
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
            tell(round % 3 == 0 ? 52 : 51);
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
