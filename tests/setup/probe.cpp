// Run under Wine by setup_test.
//   probe registry FILE FILE
//     Saves HKEY_LOCAL_MACHINE and HKEY_CURRENT_USER as Wine stores them, with the keys of both word sizes, and prints
//     what the next start renames or deletes.
//   probe pages CAPTION [BUTTON ...]
//     Waits for a window whose caption begins with CAPTION and presses its buttons by their numbers, each when its page
//     is there and the button enabled; prints the texts shown.

#include <cstdio>
#include <cstdlib>
#include <cwchar>
#include <iterator>

#include <windows.h>

namespace {

constexpr DWORD kLimitMs = 30000;
constexpr DWORD kPollMs = 10;

struct Search {
    const wchar_t* caption;
    // The number of a button that the window must have, or 0.
    int button;
    HWND window = nullptr;
};

[[noreturn]] void fail(const wchar_t* what)
{
    std::fwprintf(stderr, L"probe: %ls\n", what);
    std::exit(1);
}

BOOL CALLBACK matchCaption(HWND window, LPARAM parameter)
{
    Search& search = *reinterpret_cast<Search*>(parameter);
    wchar_t text[256] = L"";
    InternalGetWindowText(window, text, static_cast<int>(std::size(text)));
    if (IsWindowVisible(window) && std::wcsncmp(text, search.caption, std::wcslen(search.caption)) == 0 &&
        (!search.button || IsWindowEnabled(GetDlgItem(window, search.button))))
        search.window = window;
    return search.window == nullptr;
}

HWND pageOf(HWND window)
{
    return FindWindowExW(window, nullptr, L"#32770", nullptr);
}

BOOL CALLBACK printText(HWND control, LPARAM)
{
    wchar_t text[1024] = L"";
    DWORD_PTR length = 0;
    if (IsWindowVisible(control) &&
        SendMessageTimeoutW(control, WM_GETTEXT, std::size(text), reinterpret_cast<LPARAM>(text), SMTO_NORMAL, 2000,
                            &length) &&
        length > 0)
        std::wprintf(L"%ls\n", text);
    return TRUE;
}

// Returns the window if it has the button and a page other than `before`. A message box has no pages.
HWND findPage(const wchar_t* caption, int button, HWND before)
{
    Search search = {caption, button};
    EnumWindows(matchCaption, reinterpret_cast<LPARAM>(&search));
    const HWND found = search.window;
    return found && button && before && pageOf(found) == before ? nullptr : found;
}

HWND waitForPage(const wchar_t* caption, int button, HWND before)
{
    for (DWORD waited = 0; waited < kLimitMs; waited += kPollMs, Sleep(kPollMs)) {
        const HWND found = findPage(caption, button, before);
        DWORD_PTR answer = 0;
        // The program answers when it has completed the page, which may have disabled the button.
        if (found && SendMessageTimeoutW(found, WM_NULL, 0, 0, SMTO_NORMAL, kLimitMs, &answer) &&
            findPage(caption, button, before) == found)
            return found;
    }
    fail(L"the window or its button does not come");
}

int pressButtons(const wchar_t* caption, wchar_t** buttons)
{
    HWND before = nullptr;
    do {
        const int button = *buttons ? std::wcstol(*buttons, nullptr, 10) : 0;
        const HWND window = waitForPage(caption, button, before);
        EnumChildWindows(window, printText, 0);
        before = pageOf(window);
        if (button)
            PostMessageW(window, WM_COMMAND, static_cast<WPARAM>(button), 0);
    } while (*buttons && *++buttons);
    return 0;
}

int saveRegistry(const wchar_t* machineFile, const wchar_t* userFile)
{
    HANDLE token = nullptr;
    TOKEN_PRIVILEGES privileges = {1, {{{}, SE_PRIVILEGE_ENABLED}}};
    if (!OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES, &token) ||
        !LookupPrivilegeValueW(nullptr, SE_BACKUP_NAME, &privileges.Privileges[0].Luid) ||
        !AdjustTokenPrivileges(token, FALSE, &privileges, 0, nullptr, nullptr) ||
        RegSaveKeyW(HKEY_LOCAL_MACHINE, machineFile, nullptr) != ERROR_SUCCESS ||
        RegSaveKeyW(HKEY_CURRENT_USER, userFile, nullptr) != ERROR_SUCCESS)
        fail(L"the registry cannot be saved");
    static wchar_t pending[32768];
    DWORD bytes = sizeof pending - 2 * sizeof(wchar_t);
    if (RegGetValueW(HKEY_LOCAL_MACHINE, L"System\\CurrentControlSet\\Control\\Session Manager",
                     L"PendingFileRenameOperations", RRF_RT_REG_MULTI_SZ, nullptr, pending, &bytes) != ERROR_SUCCESS)
        return 0;
    // Pairs of a path and its new name, which is empty for a deletion.
    for (const wchar_t* at = pending; *at;) {
        const wchar_t* const target = at + std::wcslen(at) + 1;
        std::wprintf(L"%ls>%ls\n", at, target);
        at = target + std::wcslen(target) + 1;
    }
    return 0;
}

} // namespace

int wmain(int count, wchar_t** words)
{
    if (count == 4 && std::wcscmp(words[1], L"registry") == 0)
        return saveRegistry(words[2], words[3]);
    if (count >= 3 && std::wcscmp(words[1], L"pages") == 0)
        return pressButtons(words[2], words + 3);
    fail(L"wrong arguments");
}
