#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"
#include "ui/resource.h"

namespace tavi {
namespace {

using namespace test;

struct RestoreProgressWindowTest : UiTest {
    RestoreProgressWindowTest()
    {
        dispatch(std::make_unique<EventMessage>(52));
    }
    static void tell(std::uint32_t type, std::uint64_t value = 0, const wxString& text = wxString())
    {
        dispatch(std::make_unique<EventMessage>(type, 0, value, 0, std::make_shared<const wxString>(text)));
    }
    static HWND hiddenDialog()
    {
        HWND dialog = nullptr;
        waitUntil([&] {
            const auto window = RestoreProgressWindow::current();
            dialog = window ? window->dialog() : nullptr;
            return dialog != nullptr;
        });
        return dialog;
    }
    static bool shows(HWND dialog, int control, const std::wstring& text)
    {
        const bool found = waitUntil([&] { return controlText(dialog, control) == text; });
        EXPECT_EQ(controlText(dialog, control), text);
        return found;
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
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = hiddenDialog();
    EXPECT_FALSE(IsWindowVisible(dialog));
    EXPECT_EQ(moduleRefCount(), 2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CLOSE);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Waiting to begin restore...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");
    shows(dialog, TAVI_PROGRESS_SPEED, L"0.0 b/s");
    tell(51);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    tell(56, 1 << 30); // found before the first item: not part of its speed
    tell(53, 1000);
    tell(54, 0, L"C:\\d\\A & B.txt");
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\A & B.txt");
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    tell(56, 500);
    EXPECT_TRUE(waitUntil([&] { return position(dialog) == 125; }));
    EXPECT_TRUE(waitUntil([&] { return transferStatus().restoreSpeed() > 0; }));
    transferStatus().restoreRateLong = 1000;
    shows(dialog, TAVI_PROGRESS_REMAINING, L"4 seconds");
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");

    // A second restore joins; its start leaves the bar where it is until an amount moves it.
    RestoreProgressWindow::getOrCreate();
    EXPECT_TRUE(waitUntil([&] { return position(dialog) == 125; }));
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
    RestoreProgressWindow::getOrCreate();
    const HWND dialog = hiddenDialog();
    tell(51);
    tell(52);
    EXPECT_TRUE(gone(dialog));
    EXPECT_EQ(transferStatus().restoreStarted, false);
    EXPECT_EQ(FindWindowW(L"#32770", L"Restoring..."), nullptr);
}

TEST_F(RestoreProgressWindowTest, ButtonsCloseItAtOnceAndOnlyCancelCancels)
{
    const std::string cancel = bytes("34000000 14000000") + std::string(20, '\0');
    const struct {
        UINT message;
        WPARAM command;
        bool serviceRuns;
        bool cancels;
    } cases[] = {{WM_COMMAND, TAVI_PROGRESS_CANCEL, true, true},
                 {WM_COMMAND, TAVI_PROGRESS_CANCEL, false, false},
                 {WM_COMMAND, TAVI_PROGRESS_CLOSE, true, false},
                 {WM_CLOSE, 0, true, false}};
    for (const auto& test : cases) {
        std::optional<PipeServer> server;
        if (test.serviceRuns)
            server.emplace(L"\\\\.\\pipe\\tavibackup", DWORD{PIPE_ACCESS_INBOUND});
        RestoreProgressWindow::getOrCreate();
        RestoreProgressWindow::getOrCreate();
        const HWND dialog = hiddenDialog();
        tell(51);
        PostMessageW(dialog, test.message, test.command, 0);
        EXPECT_TRUE(gone(dialog));
        EXPECT_TRUE(transferStatus().restoreStarted);
        tell(54, 0, L"later"); // nobody is there to take it
        if (test.cancels) {
            EXPECT_EQ(hex(server->readAll()), hex(cancel));
        } else if (server) {
            EXPECT_TRUE(WaitNamedPipeW(L"\\\\.\\pipe\\tavibackup", 1)) << "nobody has come";
        }
        EXPECT_EQ(log.take(), test.serviceRuns ? std::vector<std::string>()
                                               : std::vector<std::string>{"1: Error: Unable to open command pipe: 2"});
    }
}

// Restores that are asked for, end and are closed on several threads at once.
TEST_F(RestoreProgressWindowTest, SurvivesEveryOrderOfEnds)
{
    std::atomic<bool> done{false};
    std::vector<std::thread> threads;
    threads.emplace_back([&] {
        for (int round = 0; round < 3000; ++round)
            tell(round % 3 == 0 ? 52 : 51);
        done = true;
    });
    threads.emplace_back([&] {
        while (!done) {
            RestoreProgressWindow::getOrCreate();
            Sleep(1);
        }
    });
    while (!done) {
        if (const auto window = RestoreProgressWindow::current())
            PostMessageW(window->dialog(), WM_CLOSE, 0, 0);
        Sleep(3);
    }
    for (std::thread& thread : threads)
        thread.join();
    waitUntil([] {
        if (const auto window = RestoreProgressWindow::current())
            PostMessageW(window->dialog(), WM_CLOSE, 0, 0);
        return moduleRefCount() == 0;
    });
}

} // namespace
} // namespace tavi
