#include "ui/RestoreProgressWindow.h"

#include <algorithm>
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
#include "ui/DialogLayout.h"
#include "ui/resource.h"
#include "ui/Translations.h"
#include "ui/WindowFrame.h"

namespace tavi {
namespace {

// Notifies the dialog of new messages from the service. lParam is the window's object.
constexpr UINT kMessagesArrived = WM_USER + 1;
constexpr UINT_PTR kTimer = 1;
constexpr UINT kTimerMs = 250;
// A restore that ends sooner must not flash a window.
constexpr DWORD kShowAfterMs = 500;

CriticalSection windowLock;
std::shared_ptr<RestoreProgressWindow> currentWindow;

void deliverToWindow(const PipeMessage& message)
{
    if (const auto window = RestoreProgressWindow::current())
        window->deliver(message);
}

INT_PTR CALLBACK progressProcedure(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam)
{
    return guarded("progress window", INT_PTR{FALSE}, [&]() -> INT_PTR {
        auto* const window = dialogObject<RestoreProgressWindow>(dialog, message, lParam);
        return window ? window->handleMessage(dialog, message, wParam, lParam) : FALSE;
    });
}

// The argument is the thread's own reference to the window, on the heap.
using WindowReference = std::shared_ptr<RestoreProgressWindow>;

void runProgressWindow(void* argument)
{
    const std::unique_ptr<const WindowReference> window(static_cast<const WindowReference*>(argument));
    ++moduleRefCount();
    const ActivationScope activation;
    const auto layout = dialogTemplate(TAVI_DIALOG_PROGRESS);
    const HWND dialog = CreateDialogIndirectParamW(moduleInstance(), reinterpret_cast<LPCDLGTEMPLATEW>(layout.data()),
                                                   nullptr, progressProcedure, reinterpret_cast<LPARAM>(window->get()));
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
    const std::lock_guard guard(windowLock);
    if (!currentWindow) {
        transferStatus();
        setMessageSink(deliverToWindow);
        const auto window = std::make_shared<RestoreProgressWindow>();
        auto reference = std::make_unique<WindowReference>(window);
        if (!KernelHandle(startModuleThread(runProgressWindow, reference.get()))) {
            logError(L"Unable to start the progress window");
            return;
        }
        static_cast<void>(reference.release());
        currentWindow = window;
    }
    ++currentWindow->restores_;
}

std::shared_ptr<RestoreProgressWindow> RestoreProgressWindow::current()
{
    const std::lock_guard guard(windowLock);
    return currentWindow;
}

bool RestoreProgressWindow::dropRestores(std::int32_t count)
{
    restores_ -= std::min(count, restores_);
    if (restores_ == 0 && currentWindow.get() == this)
        currentWindow.reset();
    return restores_ > 0;
}

void RestoreProgressWindow::dropAllRestores()
{
    const std::lock_guard guard(windowLock);
    dropRestores(restores_);
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
        handleArrivals(window);
        return TRUE;
    case kMessagesArrived:
        // The dialog manager uses this number, too: DM_SETDEFID.
        if (lParam != reinterpret_cast<LPARAM>(this))
            return FALSE;
        handleArrivals(window);
        return TRUE;
    case WM_COMMAND:
        if (LOWORD(wParam) == TAVI_PROGRESS_CANCEL)
            cancel(window);
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
        moduleLock_.reset();
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
    if (isTranslated()) {
        fitButtons(window, {TAVI_PROGRESS_CANCEL, TAVI_PROGRESS_CLOSE});
        extendLabel(window, TAVI_PROGRESS_REMAINING, TAVI_PROGRESS_CLOSE);
        // The widest rate of each unit.
        fitLabel(window, TAVI_PROGRESS_SPEED,
                 {formatRate(1023), formatRate((1u << 20) - 1), formatRate((1u << 30) - 1), formatRate(~0u)});
        extendLabel(window, TAVI_PROGRESS_STATUS, TAVI_PROGRESS_SPEED);
    }
    setWindowIcons(window);
    placeWindow(window, nullptr);
}

void RestoreProgressWindow::cancel(HWND window)
{
    // A service that connects but does not read blocks this thread: the user must not see that window any more, and the
    // next restore needs one of its own.
    ShowWindow(window, SW_HIDE);
    dropAllRestores();
    // The window closes even if no service receives the command.
    guarded("restore cancellation", [] {
        auto command = cancelRestoreCommand();
        sendCommand(command);
    });
}

void RestoreProgressWindow::deliver(const PipeMessage& message)
{
    const HWND dialog = dialog_;
    if (!dialog)
        return;
    const auto isEvent = [&](EventType type) { return message.kind() == MessageKind::event && message.type() == type; };
    const bool isEnd = isEvent(EventType::restoreEnded);
    const bool isStartOrEnd = isEnd || isEvent(EventType::restoreStarted);
    bool isFirstItem = false;
    bool mustNotify = false;
    {
        const std::lock_guard guard(windowLock);
        ends_ += isEnd ? 1 : 0;
        if (isStartOrEnd)
            awaitsFirstItem_ = true;
        else if (isEvent(EventType::restoreItem))
            isFirstItem = std::exchange(awaitsFirstItem_, false);
        if (isStartOrEnd || message.kind() == MessageKind::snapshot) {
            linesAreOutdated_ = true;
            mustNotify = !std::exchange(isNotified_, true);
        }
    }
    // The speed must not include the time of the search for the first item.
    if (isFirstItem)
        transferStatus().restoreRing.clearRing();
    // If the notification is lost, the timer makes up for it.
    if (mustNotify)
        SendNotifyMessageW(dialog, kMessagesArrived, 0, reinterpret_cast<LPARAM>(this));
}

void RestoreProgressWindow::handleArrivals(HWND window)
{
    bool isHeld = false;
    {
        const std::lock_guard guard(windowLock);
        isHeld = dropRestores(std::exchange(ends_, 0));
        isNotified_ = false;
        if (std::exchange(linesAreOutdated_, false)) {
            // The bar itself keeps its position until the next refresh with another one.
            position_ = 0;
            remainingLine_.clear();
            statusLine_.clear();
        }
    }
    if (isHeld)
        refresh();
    else
        DestroyWindow(window);
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
