#pragma once

#include <functional>
#include <string>
#include <vector>

#include "FolderWindow.h"

namespace filemanager {

// Plays a script against the file manager's window and against the dialogs that handlers open in this process. It runs
// on a thread of its own, so that it can see and answer what is on screen while the window is in a menu; every wait has
// a limit.
class Script {
  public:
    Script(FolderWindow& window, Output& output, std::wstring text);
    Script(const Script&) = delete;
    Script& operator=(const Script&) = delete;
    ~Script();

    static std::wstring commandsHelp();

    void start();
    // Called when the window is gone; the exit code of the process.
    int finish();

  private:
    using Arguments = std::vector<std::wstring>;
    struct Command {
        const wchar_t* name;
        const wchar_t* arguments;
        const wchar_t* help;
        std::size_t fewest;
        std::size_t most;
        void (*run)(Script&, const Arguments&);
    };
    static const std::vector<Command>& commands();

    static DWORD WINAPI threadBody(void* script);
    void play();
    void fail(const std::wstring& text);
    void abandon(const std::wstring& text);
    void runLine(const std::wstring& line);
    void onWindow(const std::function<void()>& action);
    void pause(DWORD duration);
    void waitUntil(const std::function<bool()>& met, DWORD limit, const std::wstring& otherwise);
    HWND window(const std::wstring& title) const;
    HWND control(const std::wstring& title, const std::wstring& id) const;
    void menu();
    void openPage(const std::wstring& classId);
    void watch(const std::wstring& library);
    void unload(const Arguments& arguments);
    void repeat(const Arguments& arguments);
    void hold(const std::wstring& classId);
    void retry(const Arguments& arguments);
    void tryLine(const std::wstring& line);
    void expect(const Arguments& texts, bool present);

    FolderWindow& folder_;
    HWND owner_ = nullptr;
    Output& output_;
    std::wstring text_;
    HANDLE stop_;
    HANDLE thread_ = nullptr;
    std::vector<IUnknown*> held_;
    int lineNumber_ = 0;
    bool ended_ = false;
    bool failed_ = false;
};

} // namespace filemanager
