#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "core/CriticalSection.h"
#include "core/Module.h"
#include "link/PendingMessages.h"

namespace tavi {

// The "Restoring..." window, at most one in the process. It follows the transfer status and cancels the restore when
// the user asks for it. It has a thread and a message loop of its own, because the host's threads must not wait for it.
//
// Each queued restore holds the window until the service reports its end. The window closes with the last of them, or
// at once when the user closes it. Shared pointers keep the memory only.
class RestoreProgressWindow : public std::enable_shared_from_this<RestoreProgressWindow> {
  public:
    // Adds a restore to the window, which is created if there is none. Any thread.
    static void getOrCreate();
    // Returns the window while a restore holds it, else null. Any thread.
    static std::shared_ptr<RestoreProgressWindow> current();

    RestoreProgressWindow() = default;
    RestoreProgressWindow(const RestoreProgressWindow&) = delete;
    RestoreProgressWindow& operator=(const RestoreProgressWindow&) = delete;

    // Returns null before the dialog exists and once it is being destroyed. Any thread.
    HWND dialog() const noexcept
    {
        return dialog_;
    }
    // Adds a pending message and notifies the dialog, without waiting. Destroys the message if there is no dialog. Any
    // thread.
    void deliver(std::unique_ptr<PipeMessage> message);

    // Handles a message of the dialog and returns the dialog procedure's result. The dialog's thread.
    INT_PTR handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam);

  private:
    bool isCurrent() const;
    void dropRestore();
    void dropAllRestores();
    void initialize(HWND window);
    bool acceptNotification(const PipeMessage* notification);
    std::unique_ptr<PipeMessage> takePending();
    void handlePending(HWND window);
    void handleEvent(EventType type);
    void beginAnew();
    void refresh();
    void showText(int control, wxString& shown, const wxString& text);

    // Guarded by the lock of the registered window; 0 once this is not the registered one.
    std::int32_t restores_ = 0;
    std::atomic<HWND> dialog_{nullptr};
    HWND progressBar_ = nullptr;
    wxString statusLine_;
    wxString remainingLine_;
    wxString speedLine_;
    std::int32_t position_ = 0;
    bool awaitingFirstItem_ = false;
    CriticalSection pendingLock_;
    PendingMessages pending_;
    std::optional<ModuleLock> lock_{std::in_place};
};

} // namespace tavi
