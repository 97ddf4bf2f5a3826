#pragma once

#include <windows.h>

// What the module's top-level windows have in common.
namespace tavi {

// Centres the window over the host's, or on the screen where the user is working, inside the work area.
void placeWindow(HWND window, HWND host);

// The restore icon for caption and task bar.
void setWindowIcons(HWND window);

} // namespace tavi
