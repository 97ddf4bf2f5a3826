#include "Controls.h"

#include <algorithm>
#include <vector>

#include <commctrl.h>

#include "common/Text.h"

namespace filemanager {
namespace {

using tools::Failure;
using tools::toNumber;

constexpr int kCellLength = 512;

DWORD_PTR ask(HWND window, UINT message, WPARAM wParam = 0, LPARAM lParam = 0)
{
    DWORD_PTR answer = 0;
    if (!SendMessageTimeoutW(window, message, wParam, lParam, SMTO_NORMAL, kAnswerMs, &answer))
        throw Failure{L"the window is gone or does not answer"};
    return answer;
}

template <class Struct>
DWORD_PTR ask(HWND window, UINT message, WPARAM wParam, Struct* argument)
{
    return ask(window, message, wParam, reinterpret_cast<LPARAM>(argument));
}

std::wstring titleOf(HWND window)
{
    wchar_t title[256] = L"";
    InternalGetWindowText(window, title, 256);
    return title;
}

std::wstring classOf(HWND window)
{
    wchar_t name[64] = L"";
    GetClassNameW(window, name, 64);
    return name;
}

BOOL CALLBACK collect(HWND found, LPARAM list)
{
    reinterpret_cast<std::vector<HWND>*>(list)->push_back(found);
    return TRUE;
}

std::vector<HWND> controlsOf(HWND window)
{
    std::vector<HWND> found;
    EnumChildWindows(window, collect, reinterpret_cast<LPARAM>(&found));
    return found;
}

bool isOwnVisible(HWND window)
{
    DWORD process = 0;
    GetWindowThreadProcessId(window, &process);
    return process == GetCurrentProcessId() && IsWindowVisible(window);
}

std::wstring columnTitle(HWND header, WPARAM column)
{
    wchar_t text[kCellLength] = L"";
    HDITEMW item = {};
    item.mask = HDI_TEXT;
    item.pszText = text;
    item.cchTextMax = kCellLength;
    ask(header, HDM_GETITEMW, column, &item);
    return text;
}

std::wstring cellText(HWND list, WPARAM row, WPARAM column)
{
    wchar_t text[kCellLength] = L"";
    LVITEMW item = {};
    item.iSubItem = static_cast<int>(column);
    item.pszText = text;
    item.cchTextMax = kCellLength;
    ask(list, LVM_GETITEMTEXTW, row, &item);
    return text;
}

} // namespace

HWND findWindow(const std::wstring& title, bool enabledOnly)
{
    std::vector<HWND> windows;
    EnumWindows(collect, reinterpret_cast<LPARAM>(&windows));
    const auto found = std::find_if(windows.begin(), windows.end(), [&](HWND window) {
        return isOwnVisible(window) && titleOf(window) == title && (!enabledOnly || IsWindowEnabled(window));
    });
    return found == windows.end() ? nullptr : *found;
}

HWND findControl(HWND window, const std::wstring& id)
{
    std::vector<HWND> controls = controlsOf(window);
    std::stable_partition(controls.begin(), controls.end(),
                          [window](HWND child) { return GetParent(child) == window; });
    const auto found = std::find_if(controls.begin(), controls.end(), [wanted = toNumber(id)](HWND child) {
        return static_cast<WORD>(GetDlgCtrlID(child)) == wanted;
    });
    if (found == controls.end())
        throw Failure{L"no control " + id + L" in " + titleOf(window)};
    return *found;
}

std::wstring textOf(HWND control)
{
    std::wstring text(ask(control, WM_GETTEXTLENGTH) + 1, L'\0');
    text.resize(ask(control, WM_GETTEXT, text.size(), text.data()));
    // The text of a control with an icon is this character and the icon's number.
    return text.compare(0, 1, L"\xFFFF") == 0 ? L"" : text;
}

void clickButton(HWND button)
{
    if (!IsWindowEnabled(button))
        throw Failure{L"the button is disabled"};
    // SendMessage would return only after a message box that the button opens is closed.
    PostMessageW(button, BM_CLICK, 0, 0);
}

void selectRow(HWND list, const std::wstring& row)
{
    LVITEMW item = {};
    item.stateMask = LVIS_SELECTED | LVIS_FOCUSED;
    ask(list, LVM_SETITEMSTATE, static_cast<WPARAM>(-1), &item);
    item.state = item.stateMask;
    if (!ask(list, LVM_SETITEMSTATE, static_cast<WPARAM>(toNumber(row)), &item))
        throw Failure{L"the list has no row " + row};
}

POINT clickPoint(HWND control, const std::wstring* row)
{
    constexpr LONG kRowStartPixels = 40;
    RECT box = {};
    if (!row) {
        GetClientRect(control, &box);
    } else {
        box.left = LVIR_LABEL;
        if (!ask(control, LVM_GETITEMRECT, static_cast<WPARAM>(toNumber(*row)), &box))
            throw Failure{L"the list has no row " + *row};
        box.right = std::min(box.right, box.left + kRowStartPixels);
    }
    POINT point = {(box.left + box.right) / 2, (box.top + box.bottom) / 2};
    ClientToScreen(control, &point);
    return point;
}

void printList(HWND list)
{
    const auto header = reinterpret_cast<HWND>(ask(list, LVM_GETHEADER));
    const WPARAM columns = ask(header, HDM_GETITEMCOUNT);
    const WPARAM rows = ask(list, LVM_GETITEMCOUNT);
    std::wstring line = L" ";
    for (WPARAM column = 0; column < columns; ++column)
        line += (column ? L"\t" : L" ") + columnTitle(header, column);
    tools::print(line);
    for (WPARAM row = 0; row < rows; ++row) {
        line = ask(list, LVM_GETITEMSTATE, row, LVIS_SELECTED) ? L"*" : L" ";
        for (WPARAM column = 0; column < columns; ++column)
            line += (column ? L"\t" : L" ") + cellText(list, row, column);
        tools::print(line);
    }
}

void printControls(HWND window)
{
    for (const HWND control : controlsOf(window)) {
        if (IsWindowVisible(control))
            tools::print(std::to_wstring(static_cast<WORD>(GetDlgCtrlID(control))) + L"\t" + classOf(control) + L"\t" +
                         textOf(control) + (IsWindowEnabled(control) ? L"" : L" [disabled]"));
    }
}

} // namespace filemanager
