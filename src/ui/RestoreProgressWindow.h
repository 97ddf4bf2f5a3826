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

// The "Restoring..." window, at most one in the process, with a thread and a message loop of its own: the shell's
// threads that ask for it must not be kept. It follows the transfer status and cancels the restore on request.
//
// Counted: each queued restore holds one reference, which the service's report of its end drops, and whoever is at work
// with the window holds one meanwhile. With the last one the window goes. When the user closes it, it goes at once
// whatever references remain; dropping those later does nothing. The memory lives as long as any of them.
class RestoreProgressWindow {
  public:
    // Makes the window if there is none, and adds the reference that stands for the restore. Any thread.
    static void getOrCreate();

    // A reference for as long as it lives, or none.
    class Reference {
      public:
        explicit Reference(std::shared_ptr<RestoreProgressWindow> window) noexcept : window_(std::move(window)) {}
        Reference(Reference&&) noexcept = default;
        Reference& operator=(Reference&&) = delete;
        ~Reference()
        {
            if (window_)
                window_->release();
        }
        RestoreProgressWindow* operator->() const noexcept
        {
            return window_.get();
        }
        explicit operator bool() const noexcept
        {
            return window_ != nullptr;
        }

      private:
        std::shared_ptr<RestoreProgressWindow> window_;
    };
    // Any thread.
    static Reference current();

    RestoreProgressWindow() = default;
    RestoreProgressWindow(const RestoreProgressWindow&) = delete;
    RestoreProgressWindow& operator=(const RestoreProgressWindow&) = delete;

    // Empty until the window exists and again once it is going. Any thread.
    HWND dialog() const noexcept
    {
        return dialog_;
    }
    // Adds a message for the window to handle and notifies it, without waiting. Destroys the message when there is no
    // window. Messages that the window never handles are destroyed with this object. Any thread.
    void deliver(std::unique_ptr<PipeMessage> message);

    // Below: the window's thread.
    bool adoptDialog(HWND dialog);
    INT_PTR handleMessage(HWND window, UINT message, WPARAM wParam, LPARAM lParam);

  private:
    void release();
    void destroy(HWND window);
    bool isRegistered() const;
    void initialize(HWND window);
    bool acceptNotification(const PipeMessage* notification);
    std::unique_ptr<PipeMessage> takePending();
    void handlePending();
    void handlePipeMessage(const PipeMessage& message);
    void handleEvent(EventType type);
    void beginAnew();
    void refresh();
    void showText(int control, wxString& shown, const wxString& text);

    std::atomic<std::int32_t> refs_{0};
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
