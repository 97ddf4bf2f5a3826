#include "ui/RestoreProgressWindow.h"

#include <mutex>
#include <utility>

#include <commctrl.h>
#include <objbase.h>
#include <wx/intl.h>

#include "core/Boundary.h"
#include "core/CriticalSection.h"
#include "core/DisplayFormat.h"
#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/ModuleThread.h"
#include "link/CommandPipe.h"
#include "link/StatusListener.h"
#include "ui/ActivationScope.h"
#include "ui/resource.h"
#include "ui/WindowFrame.h"

namespace tavi {
namespace {

// Notifies the dialog of pending messages. lParam is one of them.
constexpr UINT kMessagesPending = WM_USER + 1;
constexpr UINT_PTR kTimer = 1;
constexpr UINT kTimerMs = 250;
// A restore that ends sooner must not flash a window.
constexpr DWORD kShowAfterMs = 500;

// The registered window.
struct Registry {
    CriticalSection lock;
    std::shared_ptr<RestoreProgressWindow> window;
};
Registry theRegistry;

void deliverToWindow(std::unique_ptr<PipeMessage> message)
{
    if (const auto window = RestoreProgressWindow::current())
        window->deliver(std::move(message));
}

INT_PTR CALLBACK progressProcedure(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("progress window", INT_PTR{FALSE}, [&]() -> INT_PTR {
        auto* const window = dialogObject<RestoreProgressWindow>(dialog, message, lParam);
        return window ? window->handleMessage(dialog, message, wParam, lParam) : FALSE;
    });
}

void runProgressWindow(void* argument)
{
    const auto window = static_cast<RestoreProgressWindow*>(argument)->shared_from_this();
    ++moduleRefCount();
    const ActivationScope activation;
    const HWND dialog = CreateDialogParamW(moduleInstance(), MAKEINTRESOURCEW(TAVI_DIALOG_PROGRESS), nullptr,
                                           progressProcedure, reinterpret_cast<LPARAM>(window.get()));
    if (!dialog) {
        // The count stays raised: the window stays registered for its restores and needs the module's code.
        logError(L"Unable to create the progress window (%lu)", GetLastError());
        return;
    }
    runDialogLoop(dialog, kShowAfterMs);
    --moduleRefCount();
    CoFreeUnusedLibraries();
}

} // namespace

void RestoreProgressWindow::getOrCreate()
{
    const std::lock_guard guard(theRegistry.lock);
    auto& window = theRegistry.window;
    if (!window) {
        transferStatus();
        setMessageSink(deliverToWindow);
        window = std::make_shared<RestoreProgressWindow>();
        if (!KernelHandle(startModuleThread(runProgressWindow, window.get()))) {
            logError(L"Unable to start the progress window");
            window.reset();
            return;
        }
    }
    ++window->restores_;
}

std::shared_ptr<RestoreProgressWindow> RestoreProgressWindow::current()
{
    const std::lock_guard guard(theRegistry.lock);
    return theRegistry.window;
}

bool RestoreProgressWindow::isCurrent() const
{
    const std::lock_guard guard(theRegistry.lock);
    return restores_ > 0;
}

void RestoreProgressWindow::dropRestore()
{
    const std::lock_guard guard(theRegistry.lock);
    if (--restores_ == 0)
        theRegistry.window.reset();
}

void RestoreProgressWindow::dropAllRestores()
{
    const std::lock_guard guard(theRegistry.lock);
    if (std::exchange(restores_, 0) > 0)
        theRegistry.window.reset();
}

INT_PTR RestoreProgressWindow::handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    const ActivationScope activation;
    switch (message) {
    case WM_INITDIALOG:
        initialize(window);
        return TRUE;
    case WM_TIMER:
        if (wParam != kTimer)
            return FALSE;
        transferStatus().timerTick();
        refresh();
        return TRUE;
    case kMessagesPending:
        // The dialog manager uses this number, too: DM_SETDEFID.
        if (!acceptNotification(reinterpret_cast<const PipeMessage*>(lParam)))
            return FALSE;
        handlePending(window);
        return TRUE;
    case WM_COMMAND:
        // The window closes even if no service receives the cancellation.
        if (LOWORD(wParam) == TAVI_PROGRESS_CANCEL) {
            guarded("restore cancellation", [] {
                auto command = CommandPipe::cancelRestore();
                CommandPipe::sendCommand(command);
            });
        }
        // With Close the service goes on with the restore.
        if (LOWORD(wParam) == TAVI_PROGRESS_CANCEL || LOWORD(wParam) == TAVI_PROGRESS_CLOSE)
            DestroyWindow(window);
        return FALSE;
    case WM_CLOSE:
        DestroyWindow(window);
        return TRUE;
    case WM_DESTROY:
        dialog_ = nullptr;
        KillTimer(window, kTimer);
        PostQuitMessage(0);
        dropAllRestores();
        lock_.reset();
        CoFreeUnusedLibraries();
        return TRUE;
    default:
        return FALSE;
    }
}

void RestoreProgressWindow::initialize(HWND window)
{
    dialog_ = window;
    SetTimer(window, kTimer, kTimerMs, nullptr);
    progressBar_ = GetDlgItem(window, TAVI_PROGRESS_BAR);
    SendMessageW(progressBar_, PBM_SETRANGE32, 0, TransferStatus::kBarRange);
    SetWindowTextW(window, _("Restoring...").wc_str());
    SetDlgItemTextW(window, TAVI_PROGRESS_CLOSE, _("C&lose").wc_str());
    SetDlgItemTextW(window, TAVI_PROGRESS_CANCEL, _("&Cancel").wc_str());
    setWindowIcons(window);
    placeWindow(window, nullptr);
}

void RestoreProgressWindow::deliver(std::unique_ptr<PipeMessage> message)
{
    const HWND dialog = dialog_;
    if (!dialog)
        return;
    const PipeMessage* notification = nullptr;
    {
        const std::lock_guard guard(pendingLock_);
        notification = pending_.put(std::move(message));
    }
    if (notification && !SendNotifyMessageW(dialog, kMessagesPending, 0, reinterpret_cast<LPARAM>(notification))) {
        const std::lock_guard guard(pendingLock_);
        pending_.clear();
    }
}

bool RestoreProgressWindow::acceptNotification(const PipeMessage* notification)
{
    const std::lock_guard guard(pendingLock_);
    return pending_.accept(notification);
}

std::unique_ptr<PipeMessage> RestoreProgressWindow::takePending()
{
    const std::lock_guard guard(pendingLock_);
    return pending_.take();
}

void RestoreProgressWindow::handlePending(HWND window)
{
    while (isCurrent()) {
        const auto message = takePending();
        if (!message) {
            // The transfer status has had all of these messages already, so one refresh is enough.
            refresh();
            return;
        }
        if (message->kind() == MessageKind::event)
            handleEvent(message->type());
        else if (message->kind() == MessageKind::snapshot)
            beginAnew();
    }
    // The last restore has ended. Messages that are still pending are destroyed with this object.
    DestroyWindow(window);
}

void RestoreProgressWindow::handleEvent(EventType type)
{
    switch (type) {
    case EventType::restoreEnded:
        dropRestore();
        [[fallthrough]];
    case EventType::restoreStarted:
        beginAnew();
        awaitingFirstItem_ = true;
        break;
    case EventType::restoreItem:
        // The speed must not include the time of the search for the first item.
        if (std::exchange(awaitingFirstItem_, false))
            transferStatus().restoreRing.clearRing();
        break;
    default:
        break;
    }
}

void RestoreProgressWindow::beginAnew()
{
    // The bar itself keeps its position until the next refresh with another one.
    position_ = 0;
    remainingLine_.clear();
    statusLine_.clear();
}

void RestoreProgressWindow::showText(int control, wxString& shown, const wxString& text)
{
    if (text == shown)
        return;
    shown = text;
    SetDlgItemTextW(dialog_, control, text.wc_str());
}

void RestoreProgressWindow::refresh()
{
    TransferStatus& status = transferStatus();
    const auto seconds = status.remainingSeconds();
    showText(TAVI_PROGRESS_REMAINING, remainingLine_, seconds ? formatDuration(*seconds) : _("Unknown"));

    if (const std::int32_t position = status.barPosition(); position != position_) {
        SendMessageW(progressBar_, PBM_SETPOS, static_cast<WPARAM>(position), 0);
        position_ = position;
    }

    const wxString item = status.restoreText.get();
    showText(TAVI_PROGRESS_STATUS, statusLine_,
             !item.empty()           ? item
             : status.restoreStarted ? _("Finding file on server...")
                                     : _("Waiting to begin restore..."));
    showText(TAVI_PROGRESS_SPEED, speedLine_, formatRate(status.restoreSpeed()));
}

} // namespace tavi
