#pragma once

#include <fstream>
#include <functional>

#include <windows.h>
#include <prsht.h>
#include <gtest/gtest.h>

#include "core/Module.h"
#include "manifest/CurrentManifest.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"
#include "ui/Translations.h"

// The tests drive this process's dialogs from another thread, by the messages that a user's actions cause.
namespace tavi::test {

// Waits at most a minute, which ends no wait on the slowest machine.
inline bool waitUntil(const std::function<bool()>& condition)
{
    bool met = false;
    for (const DWORD start = GetTickCount(); !(met = condition()) && GetTickCount() - start < 60000;)
        Sleep(5);
    return met;
}

inline void waitForThreads()
{
    EXPECT_TRUE(waitUntil([] { return moduleRefCount() == 0 && !isWatcherActive(); }));
}

// Returns a visible dialog of this process with that caption (null: any) that is neither of the two.
inline HWND waitDialog(const wchar_t* caption, HWND other = nullptr, HWND another = nullptr)
{
    HWND window = nullptr;
    EXPECT_TRUE(waitUntil([&] {
        DWORD process = 0;
        window = FindWindowExW(nullptr, window, L"#32770", caption);
        GetWindowThreadProcessId(window, &process);
        return process == GetCurrentProcessId() && IsWindowVisible(window) && window != other && window != another;
    }));
    return window;
}

// Posts the click: one that opens a box does not return before the box is gone.
inline BOOL click(HWND dialog, int id)
{
    return PostMessageW(GetDlgItem(dialog, id), BM_CLICK, 0, 0);
}

inline std::wstring controlText(HWND dialog, int id)
{
    wchar_t text[1024];
    return std::wstring(text, GetDlgItemTextW(dialog, id, text, 1024));
}

// Accepts a page into the handle that the parameter points at; refuses it without one.
inline BOOL CALLBACK takePage(HPROPSHEETPAGE page, LPARAM taken)
{
    return taken && (*reinterpret_cast<HPROPSHEETPAGE*>(taken) = page);
}

struct UiTest : testing::Test {
    UiTest()
    {
        setModuleInstance(GetModuleHandleW(nullptr));
    }
    ~UiTest() override
    {
        stopManifestWatcher();
        waitForThreads();
        freeTranslations();
    }
    wxString in(const wxString& name) const
    {
        return service.file(name.wc_str());
    }

    LogCapture log;
    InstalledService service;
};

} // namespace tavi::test
