#pragma once

#include <string>

#include <windows.h>

// Windows of this process and their controls, as another thread reads and operates them. Every message to a window has
// a time limit; what cannot be done throws a Failure.
namespace filemanager {

// Longest time that a window gets to answer a message.
constexpr DWORD kAnswerMs = 60000;

// Returns the visible window with this title, or null. Of several with one title, a user can work with the enabled one:
// a dialog is disabled while it has a message box open.
HWND findWindow(const std::wstring& title, bool enabledOnly);

// Returns the control with this number. Those of the window itself come before those inside of its controls.
HWND findControl(HWND window, const std::wstring& id);

std::wstring textOf(HWND control);

// Returns without waiting for what the click does.
void clickButton(HWND button);

void selectRow(HWND list, const std::wstring& row);

// Returns the screen position of the middle of a control, or of the beginning of a row of a list if `row` is not null.
POINT clickPoint(HWND control, const std::wstring* row);

// Prints the titles of the columns and the rows, cells with a tab between, selected rows with a star.
void printList(HWND list);

// Prints number, class and text of each visible control.
void printControls(HWND window);

} // namespace filemanager
