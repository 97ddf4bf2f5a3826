#include "ui/RestoreProgressWindow.h"

#include <thread>

#include <commctrl.h>

#include "link/StatusListener.h"
#include "tests/link/Frames.h"
#include "tests/support/Counts.h"
#include "tests/support/Dialogs.h"
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
    EXPECT_EQ(moduleRefCount(), 2);
    ASSERT_EQ(waitDialog(L"Restoring..."), dialog);
    EXPECT_GE(GetTickCount() - start, 490u);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Waiting to begin restore...");
    shows(dialog, TAVI_PROGRESS_SPEED, L"0.0 b/s");
    tell(kStarted);
    tell(kDone, 1 << 30); // before the first item: not part of its speed
    tell(kTotal, 1000);
    tell(kItem, 0, "C:\\d\\A & B.txt");
    shows(dialog, TAVI_PROGRESS_STATUS, L"C:\\d\\A & B.txt");
    EXPECT_EQ(transferStatus().restoreRing.rateOver(60000), 0);
    tell(kDone, 500);
    const auto position = [&] { return SendDlgItemMessageW(dialog, TAVI_PROGRESS_BAR, PBM_GETPOS, 0, 0); };
    EXPECT_TRUE(waitUntil([&] { return position() == 125; }));
    tell(kItem, 0, "C:\\d\\B.txt");
    EXPECT_TRUE(waitUntil([&] { return transferStatus().restoreSpeed() > 0; })) << "only the first item clears it";
    transferStatus().restoreRateLong = 1000;
    shows(dialog, TAVI_PROGRESS_REMAINING, L"4 seconds");
    dispatch(std::make_unique<SnapshotMessage>(7, 0, 0, 0, 0));
    shows(dialog, TAVI_PROGRESS_REMAINING, L"Unknown");
    tell(kEnded);
    tell(kStarted);
    shows(dialog, TAVI_PROGRESS_STATUS, L"Finding file on server...");
    EXPECT_EQ(position(), 125) << "until an amount moves it";
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
    tell(kItem, 0, "for nobody");
    EXPECT_EQ(moduleRefCount(), 2);
    RestoreProgressWindow::current()->handleMessage(nullptr, WM_DESTROY, 0, 0);
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
    procedure =
        reinterpret_cast<WNDPROC>(SetWindowLongPtrW(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(&waitWhileBusy)));
    tell(kEnded);
    const auto item = text(L"item");
    for (int round = 0; round < 50000; ++round)
        dispatch(std::make_unique<EventMessage>(round % 100 == 0 ? kStarted : kItem, 0, 0, 0, item));
    EXPECT_TRUE(item.use_count() > 1 && item.use_count() <= 1001) << item.use_count();
    tell(kStarted);
    isBusy = false;
    shows(dialog, TAVI_PROGRESS_STATUS, L"Sucht die Datei...");
    // The dialog manager uses the number of the window's own message, too.
    SendMessageW(dialog, DM_SETDEFID, TAVI_PROGRESS_CANCEL, 0);
    EXPECT_EQ(LOWORD(SendMessageW(dialog, DM_GETDEFID, 0, 0)), TAVI_PROGRESS_CANCEL);
    tell(kEnded);
    EXPECT_TRUE(closes(dialog)) << "neither end was lost";
    EXPECT_TRUE(waitUntil([&] { return item.use_count() == 1; }));
}

TEST_F(RestoreProgressWindowTest, ClosesByEveryButtonThoughItCannotCancel)
{
    // Cancel finds no service; its line in the log throws, and so does the line about that.
    const std::function<void()> fail = [&] {
        log.onNextLine(fail);
        throw std::bad_alloc();
    };
    log.onNextLine(fail);
    const std::tuple<UINT, WPARAM, std::size_t> cases[] = {
        {WM_COMMAND, TAVI_PROGRESS_CANCEL, 2}, {WM_COMMAND, TAVI_PROGRESS_CLOSE, 0}, {WM_CLOSE, 0, 0}};
    for (const auto& [message, command, lines] : cases) {
        const HWND dialog = open();
        tell(kStarted);
        PostMessageW(dialog, message, command, 0);
        EXPECT_TRUE(closes(dialog));
        EXPECT_EQ(log.take().size(), lines);
        EXPECT_TRUE(transferStatus().restoreStarted) << "the service goes on with the restore";
        tell(kItem, 0, "later");
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
    while (!done) {
        for (int restore = 0; restore < 3; ++restore, Sleep(1))
            RestoreProgressWindow::getOrCreate();
        close();
    }
    ends.join();
    EXPECT_TRUE(waitUntil(close));
}

} // namespace
} // namespace tavi
