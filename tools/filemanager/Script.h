#pragma once

#include <atomic>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "common/Commands.h"
#include "common/Handle.h"
#include "FolderWindow.h"

namespace filemanager {

// Performs the commands of the standard input on the file manager's window and on the dialogs that handlers open in
// this process. It has a thread of its own, so that it can read and answer what is on screen while the window is in a
// menu. The first command that fails ends the process with exit code 1. Every wait has a limit.
class Script {
  public:
    explicit Script(FolderWindow& window);
    Script(const Script&) = delete;
    Script& operator=(const Script&) = delete;

    // Called when the window is gone; returns the exit code of the process.
    int finish();

  private:
    std::vector<tools::Command> commandTable();
    static DWORD WINAPI threadRoutine(void* script);
    void perform();
    // Runs the action on the window's thread.
    void onWindow(const std::function<void()>& action) const;
    void pause(std::int64_t milliseconds) const;
    void waitUntil(const std::function<bool()>& met, const std::wstring& limitMs, const std::wstring& otherwise) const;
    // The window and the control that the first arguments of a command name.
    HWND window(const std::wstring& title) const;
    HWND control(const tools::Arguments& arguments) const;
    void printMenu() const;
    void openPage(const std::wstring& classId) const;
    void watch(const std::wstring& library) const;
    void unload(const tools::Arguments& arguments) const;
    void hold(const std::wstring& classId);
    void retry(const tools::Arguments& arguments) const;
    std::optional<std::wstring> failureOf(const std::wstring& line) const;

    FolderWindow& folder_;
    const HWND owner_;
    tools::Commands commands_;
    tools::Handle stop_ = tools::createEvent();
    std::vector<ComPtr<IUnknown>> held_;
    // Only the script's thread uses it.
    bool ended_ = false;
    std::atomic<bool> failed_{false};
    tools::Handle thread_;
};

} // namespace filemanager
