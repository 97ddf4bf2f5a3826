#pragma once

#include <optional>

#include <windows.h>

// Common parts of the module's top-level windows. Called on the window's thread.
namespace tavi {

// Centres the window over the host's, or on the monitor with the cursor, inside the work area.
void placeWindow(HWND window, HWND host);

// Sets the restore icon for caption and task bar.
void setWindowIcons(HWND window);

// Runs the message loop of a modeless dialog until WM_QUIT. With `showAfterMs` it shows the hidden dialog once that
// time has passed, which it checks after each message: the dialog needs a timer, so that messages keep coming.
void runDialogLoop(HWND dialog, std::optional<DWORD> showAfterMs = std::nullopt);

// Returns the object that was passed as the dialog's creation parameter, or null before WM_INITDIALOG. For dialog
// procedures.
template <class Object>
Object* dialogObject(HWND dialog, UINT message, LPARAM lParam) noexcept
{
    if (message == WM_INITDIALOG)
        SetWindowLongPtrW(dialog, GWLP_USERDATA, lParam);
    return reinterpret_cast<Object*>(GetWindowLongPtrW(dialog, GWLP_USERDATA));
}

} // namespace tavi
