#pragma once

#include <functional>
#include <string>

#include <windows.h>

// Finding and driving this process's dialogs from another thread of it, by the messages a user's actions would cause.
namespace tavi::test {

constexpr DWORD kDialogTimeout = 10000;

inline bool waitUntil(const std::function<bool()>& condition, DWORD timeout = kDialogTimeout)
{
    for (const DWORD start = GetTickCount(); !condition(); Sleep(5)) {
        if (GetTickCount() - start > timeout)
            return false;
    }
    return true;
}

// A visible dialog of this process with that caption, other than `not_`.
inline HWND findDialog(const wchar_t* caption, HWND not_ = nullptr)
{
    for (HWND window = nullptr; (window = FindWindowExW(nullptr, window, L"#32770", caption)) != nullptr;) {
        DWORD process = 0;
        GetWindowThreadProcessId(window, &process);
        if (process == GetCurrentProcessId() && window != not_ && IsWindowVisible(window))
            return window;
    }
    return nullptr;
}

inline HWND waitDialog(const wchar_t* caption, HWND not_ = nullptr)
{
    HWND window = nullptr;
    waitUntil([&] { return (window = findDialog(caption, not_)) != nullptr; });
    return window;
}

inline bool waitGone(HWND window)
{
    return waitUntil([&] { return !IsWindow(window); });
}

// Posted: a click that opens a box does not return before the box is gone.
inline void click(HWND dialog, int id)
{
    PostMessageW(GetDlgItem(dialog, id), BM_CLICK, 0, 0);
}

inline std::wstring windowText(HWND window)
{
    wchar_t text[1024];
    return std::wstring(text, static_cast<std::size_t>(GetWindowTextW(window, text, 1024)));
}

inline std::wstring controlText(HWND dialog, int id)
{
    return windowText(GetDlgItem(dialog, id));
}

} // namespace tavi::test
