#include "ui/WindowFrame.h"

#include <algorithm>

#include "core/Module.h"
#include "ui/resource.h"

namespace tavi {

void placeWindow(HWND window, HWND host)
{
    MONITORINFO monitor{};
    monitor.cbSize = sizeof(monitor);
    POINT cursor{};
    GetCursorPos(&cursor);
    const bool hasHost = IsWindow(host);
    GetMonitorInfoW(hasHost ? MonitorFromWindow(host, MONITOR_DEFAULTTONEAREST)
                            : MonitorFromPoint(cursor, MONITOR_DEFAULTTONEAREST),
                    &monitor);
    const RECT& work = monitor.rcWork;
    RECT over = work;
    if (hasHost && IsWindowVisible(host) && !IsIconic(host))
        GetWindowRect(host, &over);
    RECT own{};
    GetWindowRect(window, &own);
    const auto place = [](LONG low, LONG high, LONG areaLow, LONG areaHigh, LONG size) {
        return std::max(areaLow, std::min((low + high - size) / 2, areaHigh - size));
    };
    SetWindowPos(window, nullptr, place(over.left, over.right, work.left, work.right, own.right - own.left),
                 place(over.top, over.bottom, work.top, work.bottom, own.bottom - own.top), 0, 0,
                 SWP_NOSIZE | SWP_NOZORDER | SWP_NOACTIVATE);
}

void setWindowIcons(HWND window)
{
    const auto icon = reinterpret_cast<LPARAM>(LoadImageW(moduleInstance(), MAKEINTRESOURCEW(TAVI_ICON_RESTORE),
                                                          IMAGE_ICON, 0, 0, LR_DEFAULTSIZE | LR_SHARED));
    SendMessageW(window, WM_SETICON, ICON_SMALL, icon);
    SendMessageW(window, WM_SETICON, ICON_BIG, icon);
}

void runDialogLoop(HWND dialog, std::optional<DWORD> showAfterMs)
{
    const DWORD start = GetTickCount();
    MSG message;
    while (GetMessageW(&message, nullptr, 0, 0) > 0) {
        if (!IsDialogMessageW(dialog, &message)) {
            TranslateMessage(&message);
            DispatchMessageW(&message);
        }
        if (showAfterMs && GetTickCount() - start >= *showAfterMs) {
            ShowWindow(dialog, SW_SHOW);
            showAfterMs.reset();
        }
    }
}

} // namespace tavi
