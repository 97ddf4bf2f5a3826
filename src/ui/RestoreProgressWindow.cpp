#include "ui/RestoreProgressWindow.h"

#include <mutex>
#include <utility>

#include <commctrl.h>
#include <objbase.h>
#include <wx/intl.h>
#include <wx/log.h>

#include "core/Boundary.h"
#include "core/CriticalSection.h"
#include "core/DisplayFormat.h"
#include "core/Handles.h"
#include "core/ModuleThread.h"
#include "link/CommandPipe.h"
#include "link/StatusListener.h"
#include "ui/ActivationScope.h"
#include "ui/WindowFrame.h"
#include "ui/resource.h"

namespace tavi {
namespace {

constexpr UINT kPipeMessage = WM_USER + 1;
// From a thread that dropped the last reference: only the window's own thread can destroy the window.
constexpr UINT kEndWindow = WM_APP;
constexpr UINT_PTR kTimer = 1;
constexpr UINT kTimerMilliseconds = 250;
constexpr DWORD kHiddenMilliseconds = 500;

struct TheWindow {
    CriticalSection lock;
    std::shared_ptr<RestoreProgressWindow> window;
};
TheWindow theWindow;

void deliverToWindow(std::unique_ptr<PipeMessage> message)
{
    if (const auto window = RestoreProgressWindow::current())
        window->deliver(std::move(message));
}

INT_PTR handleWithoutObject(HWND window, UINT message, LPARAM lParam)
{
    switch (message) {
    case WM_DESTROY:
        KillTimer(window, kTimer);
        PostQuitMessage(0);
        return TRUE;
    case kPipeMessage:
        // The message was destroyed with the object. The dialog manager's own message of that number has no lParam.
        return lParam != 0 ? TRUE : FALSE;
    case kEndWindow:
    // Should the request not have come through.
    case WM_TIMER:
        DestroyWindow(window);
        return FALSE;
    default:
        return FALSE;
    }
}

INT_PTR CALLBACK progressProcedure(HWND window, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("progress window", INT_PTR{FALSE}, [&]() -> INT_PTR {
        const auto object = RestoreProgressWindow::current();
        // By the time this window goes there may be a new one: its object is none of ours.
        const bool isOurs =
            object && (message == WM_INITDIALOG ? object->adoptDialog(window) : object->dialog() == window);
        return isOurs ? object->handleMessage(window, message, wParam, lParam)
                      : handleWithoutObject(window, message, lParam);
    });
}

void runMessageLoop(HWND window)
{
    const DWORD start = GetTickCount();
    bool shown = false;
    MSG message;
    while (GetMessageW(&message, nullptr, 0, 0) > 0) {
        if (!IsDialogMessageW(window, &message)) {
            TranslateMessage(&message);
            DispatchMessageW(&message);
        }
        // What ends sooner is not worth a flash on the screen. The timer sees to it that messages keep coming.
        if (!shown && GetTickCount() - start >= kHiddenMilliseconds) {
            shown = true;
            ShowWindow(window, SW_SHOW);
        }
    }
}

void runProgressWindow(void*)
{
    ++moduleRefCount();
    const ActivationScope activation;
    const HWND window =
        CreateDialogParamW(moduleInstance(), MAKEINTRESOURCEW(TAVI_DIALOG_PROGRESS), nullptr, progressProcedure, 0);
    if (!window) {
        // The count stays raised: the object stays registered too, and it must not outlive the module.
        wxLogError("Unable to create the progress window (%lu)", GetLastError());
        return;
    }
    // The restore may have ended before there was a dialog to tell.
    if (const auto object = RestoreProgressWindow::current(); !object || object->dialog() != window)
        DestroyWindow(window);
    runMessageLoop(window);
    --moduleRefCount();
    CoFreeUnusedLibraries();
}

} // namespace

void RestoreProgressWindow::getOrCreate()
{
    const std::lock_guard guard(theWindow.lock);
    if (!theWindow.window) {
        transferStatus();
        setMessageSink(deliverToWindow);
        theWindow.window = std::make_shared<RestoreProgressWindow>();
        if (!KernelHandle(startModuleThread(runProgressWindow, nullptr))) {
            wxLogError("Unable to start the progress window (%lu)", GetLastError());
            theWindow.window.reset();
            return;
        }
    }
    ++theWindow.window->refs_;
}

RestoreProgressWindow::Reference RestoreProgressWindow::current()
{
    const std::lock_guard guard(theWindow.lock);
    if (theWindow.window)
        ++theWindow.window->refs_;
    return Reference(theWindow.window);
}

bool RestoreProgressWindow::isRegistered() const
{
    const std::lock_guard guard(theWindow.lock);
    return theWindow.window.get() == this;
}

void RestoreProgressWindow::release()
{
    if (--refs_ > 0)
        return;
    std::shared_ptr<RestoreProgressWindow> self;
    HWND window = nullptr;
    {
        const std::lock_guard guard(theWindow.lock);
        // Someone may have taken a new reference, or dropped the last one, meanwhile.
        if (refs_ > 0 || theWindow.window.get() != this)
            return;
        self.swap(theWindow.window);
        window = dialog_.exchange(nullptr);
    }
    destroy(window);
}

void RestoreProgressWindow::destroy(HWND window)
{
    if (window && GetWindowThreadProcessId(window, nullptr) == GetCurrentThreadId())
        DestroyWindow(window);
    else if (window)
        PostMessageW(window, kEndWindow, 0, 0);
    lock_.reset();
    CoFreeUnusedLibraries();
}

bool RestoreProgressWindow::adoptDialog(HWND dialog)
{
    const std::lock_guard guard(theWindow.lock);
    if (theWindow.window.get() != this || dialog_)
        return false;
    dialog_ = dialog;
    return true;
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
    case kPipeMessage:
        // The dialog manager has the same number for another message of its own, which carries none of ours.
        if (!acceptNotification(reinterpret_cast<const PipeMessage*>(lParam)))
            return FALSE;
        handlePending();
        return TRUE;
    case WM_COMMAND:
        // A failure to tell the service must not keep the window open.
        if (LOWORD(wParam) == TAVI_PROGRESS_CANCEL) {
            guarded("restore cancellation", [] {
                auto command = CommandPipe::cancelRestore();
                CommandPipe::sendCommand(command);
            });
        }
        // Closing alone leaves the restore to go on at the service.
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
        while (isRegistered())
            release();
        return TRUE;
    default:
        return FALSE;
    }
}

void RestoreProgressWindow::initialize(HWND window)
{
    SetTimer(window, kTimer, kTimerMilliseconds, nullptr);
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
    // Does not wait for the window.
    if (notification && !SendNotifyMessageW(dialog, kPipeMessage, 0, reinterpret_cast<LPARAM>(notification))) {
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

void RestoreProgressWindow::handlePending()
{
    // With no reference but the caller's the window is ending: the rest is destroyed with the object.
    while (refs_ > 1) {
        const auto message = takePending();
        if (!message)
            break;
        handlePipeMessage(*message);
    }
    // The status is already past all of these messages.
    refresh();
}

void RestoreProgressWindow::handlePipeMessage(const PipeMessage& message)
{
    if (message.kind() == MessageKind::event) {
        handleEvent(message.type());
    } else if (message.kind() == MessageKind::snapshot) {
        beginAnew();
    }
}

void RestoreProgressWindow::handleEvent(EventType type)
{
    switch (type) {
    case EventType::restoreEnded:
        release();
        [[fallthrough]];
    case EventType::restoreStarted:
        beginAnew();
        awaitingFirstItem_ = true;
        break;
    case EventType::restoreItem:
        // The speed counts from the first item and not from the search for it.
        if (std::exchange(awaitingFirstItem_, false))
            transferStatus().restoreRing.clearRing();
        break;
    default:
        break;
    }
}

void RestoreProgressWindow::beginAnew()
{
    // The position is only noted, not sent: the bar moves with the first amount that differs.
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
