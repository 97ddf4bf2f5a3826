#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "core/Module.h"
#include "link/PipeMessage.h"

namespace tavi {

// The "Restoring..." window, at most one in the process. It follows the transfer status and cancels the restore when
// the user asks for it. It has a thread and a message loop of its own, because the host's threads must not wait for it.
//
// Each queued restore holds the window until the service reports its end. The window closes with the last of them, or
// at once when the user closes it. Shared pointers keep the memory only.
class RestoreProgressWindow {
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
    // Records the effect of a message and notifies the dialog, without waiting. Ignores the message if there is no
    // dialog. Any thread.
    void deliver(const PipeMessage& message);

    // Handles a message of the dialog and returns the dialog procedure's result. The dialog's thread.
    INT_PTR handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam);

  private:
    void initialize(HWND window);
    void cancel(HWND window);
    void handleArrivals(HWND window);
    // Drops at most all restores. Returns whether one still holds the window. For callers that have the lock.
    bool dropRestores(std::int32_t count);
    void dropAllRestores();
    void refresh();
    void showText(int control, wxString& shown, const wxString& text);

    std::atomic<HWND> dialog_{nullptr};
    HWND progressBar_ = nullptr;
    wxString statusLine_;
    wxString remainingLine_;
    wxString speedLine_;
    std::int32_t position_ = 0;
    std::optional<ModuleLock> moduleLock_{std::in_place};

    // `windowLock` guards the rest.
    // The restores that hold this window; 0 unless it is the current one.
    std::int32_t restores_ = 0;
    // Of the messages since the last handleArrivals: the ends of restores, and whether one makes every line outdated.
    std::int32_t ends_ = 0;
    bool linesAreOutdated_ = false;
    // Whether the dialog has been notified since then: once is enough, and keeps its message queue short.
    bool isNotified_ = false;
    bool awaitsFirstItem_ = false;
};

} // namespace tavi
