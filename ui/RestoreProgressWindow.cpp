#include "ui/RestoreProgressWindow.h"

#include <algorithm>
#include <mutex>
#include <utility>
#include <vector>

#include <commctrl.h>
#include <objbase.h>
#include <wx/intl.h>
#include <wx/log.h>

#include "core/Boundary.h"
#include "core/CriticalSection.h"
#include "core/DisplayFormat.h"
#include "core/Handles.h"
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

enum EventType : std::uint32_t { restoreStarted = 51, restoreEnded = 52, itemText = 54 };

struct TheWindow {
    CriticalSection lock;
    std::shared_ptr<RestoreProgressWindow> window;
};
TheWindow theWindow;

// The messages on their way to windows. A window takes only what was really sent to it, whoever else knows the message
// number, and what it never came to take is freed with it.
class MessageTray {
  public:
    PipeMessage* put(HWND window, std::unique_ptr<PipeMessage> message)
    {
        const std::lock_guard guard(lock_);
        return sent_.emplace_back(window, std::move(message)).second.get();
    }
    std::unique_ptr<PipeMessage> take(const PipeMessage* message)
    {
        const std::lock_guard guard(lock_);
        const auto found =
            std::find_if(sent_.begin(), sent_.end(), [&](const Sent& sent) { return sent.second.get() == message; });
        if (found == sent_.end())
            return nullptr;
        auto taken = std::move(found->second);
        sent_.erase(found);
        return taken;
    }
    void clear(HWND window)
    {
        const std::lock_guard guard(lock_);
        sent_.erase(std::remove_if(sent_.begin(), sent_.end(), [&](const Sent& sent) { return sent.first == window; }),
                    sent_.end());
    }

  private:
    using Sent = std::pair<HWND, std::unique_ptr<PipeMessage>>;
    CriticalSection lock_;
    std::vector<Sent> sent_;
};
MessageTray messageTray;

void deliver(std::unique_ptr<PipeMessage> message)
{
    const auto window = RestoreProgressWindow::current();
    const HWND dialog = window ? window->dialog() : nullptr;
    if (!dialog)
        return;
    const PipeMessage* const sent = messageTray.put(dialog, std::move(message));
    // Does not wait for the window.
    if (!SendNotifyMessageW(dialog, kPipeMessage, 0, reinterpret_cast<LPARAM>(sent)))
        messageTray.take(sent);
}

INT_PTR handleWithoutObject(HWND window, UINT message, LPARAM lParam)
{
    switch (message) {
    case WM_DESTROY:
        KillTimer(window, kTimer);
        PostQuitMessage(0);
        return TRUE;
    case kPipeMessage:
        return messageTray.take(reinterpret_cast<const PipeMessage*>(lParam)) ? TRUE : FALSE;
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
    messageTray.clear(window);
    --moduleRefCount();
    CoFreeUnusedLibraries();
}

} // namespace

void RestoreProgressWindow::getOrCreate()
{
    const std::lock_guard guard(theWindow.lock);
    if (!theWindow.window) {
        transferStatus();
        setMessageSink(deliver);
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
        if (const auto received = messageTray.take(reinterpret_cast<const PipeMessage*>(lParam))) {
            handlePipeMessage(*received);
            return TRUE;
        }
        return FALSE;
    case WM_COMMAND:
        if (LOWORD(wParam) == TAVI_PROGRESS_CANCEL) {
            auto command = CommandPipe::CancelRestore();
            CommandPipe::sendCommand(command);
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

void RestoreProgressWindow::handlePipeMessage(const PipeMessage& message)
{
    if (message.kind() == MessageKind::event) {
        handleEvent(static_cast<const EventMessage&>(message));
    } else if (message.kind() == MessageKind::snapshot) {
        position_ = 0;
        remainingLine_.clear();
        statusLine_.clear();
        refresh();
    }
}

void RestoreProgressWindow::handleEvent(const EventMessage& event)
{
    switch (event.type()) {
    case restoreEnded:
        release();
        [[fallthrough]];
    case restoreStarted:
        beginAnew();
        break;
    case itemText:
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
    awaitingFirstItem_ = true;
    refresh();
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
    showText(TAVI_PROGRESS_REMAINING, remainingLine_, seconds ? FormatDuration(*seconds) : _("Unknown"));

    if (const std::int32_t position = status.barPosition(); position != position_) {
        SendMessageW(progressBar_, PBM_SETPOS, static_cast<WPARAM>(position), 0);
        position_ = position;
    }

    const wxString item = status.restoreText.get();
    showText(TAVI_PROGRESS_STATUS, statusLine_,
             !item.empty()           ? item
             : status.restoreStarted ? _("Finding file on server...")
                                     : _("Waiting to begin restore..."));
    showText(TAVI_PROGRESS_SPEED, speedLine_, FormatRate(status.restoreSpeed()));
}

} // namespace tavi
