#pragma once

#include <algorithm>
#include <functional>
#include <string>

#include <windows.h>

// Finding and driving this process's dialogs from another thread of it, by the messages a user's actions would cause.
namespace tavi::test {

inline bool waitUntil(const std::function<bool()>& condition)
{
    bool met = false;
    for (const DWORD start = GetTickCount(); !(met = condition()) && GetTickCount() - start < 10000;)
        Sleep(5);
    return met;
}

// A visible dialog of this process with that caption (null: any), other than those.
inline HWND waitDialog(const wchar_t* caption, std::initializer_list<HWND> others = {})
{
    HWND window = nullptr;
    const auto isNext = [&] {
        DWORD process = 0;
        GetWindowThreadProcessId(window, &process);
        return process == GetCurrentProcessId() && IsWindowVisible(window) &&
               std::find(others.begin(), others.end(), window) == others.end();
    };
    waitUntil([&] {
        while ((window = FindWindowExW(nullptr, window, L"#32770", caption)) != nullptr && !isNext()) {
        }
        return window != nullptr;
    });
    return window;
}

// Posted: a click that opens a box does not return before the box is gone.
inline void click(HWND dialog, int id)
{
    PostMessageW(GetDlgItem(dialog, id), BM_CLICK, 0, 0);
}

inline std::wstring controlText(HWND dialog, int id)
{
    wchar_t text[1024];
    return std::wstring(text, GetDlgItemTextW(dialog, id, text, 1024));
}

} // namespace tavi::test
