#pragma once

#include <algorithm>
#include <fstream>
#include <functional>

#include <prsht.h>
#include <gtest/gtest.h>
#include <wx/stdpaths.h>
#include <wx/translation.h>

#include "core/Module.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

// What the tests of the user interface share. They drive this process's dialogs from another thread of it, by the
// messages a user's actions would cause.
namespace tavi::test {

inline std::wstring modulePath()
{
    const std::wstring own = wxStandardPaths::Get().GetExecutablePath().ToStdWstring();
    return own.substr(0, own.rfind(L"\\tests\\")) + L"\\tavishell.dll";
}

inline bool waitUntil(const std::function<bool()>& condition)
{
    bool met = false;
    for (const DWORD start = GetTickCount(); !(met = condition()) && GetTickCount() - start < 10000;)
        Sleep(5);
    return met;
}

inline void waitForThreads()
{
    EXPECT_TRUE(waitUntil([] { return moduleRefCount() == 0; }));
}

// A visible dialog of this process with that caption (null: any), other than those.
inline HWND waitDialog(const wchar_t* caption, std::initializer_list<HWND> others = {})
{
    HWND window = nullptr;
    const bool found = waitUntil([&] {
        DWORD process = 0;
        window = FindWindowExW(nullptr, window, L"#32770", caption);
        GetWindowThreadProcessId(window, &process);
        return process == GetCurrentProcessId() && IsWindowVisible(window) &&
               std::find(others.begin(), others.end(), window) == others.end();
    });
    return found ? window : nullptr;
}

// Posted: a click that opens a box does not return before the box is gone.
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
    if (taken)
        *reinterpret_cast<HPROPSHEETPAGE*>(taken) = page;
    return taken != 0;
}

struct UiTest : testing::Test {
    UiTest()
    {
        setModuleInstance(GetModuleHandleW(nullptr));
    }
    ~UiTest() override
    {
        waitForThreads();
        wxTranslations::Set(nullptr);
    }
    wxString in(const wxString& name) const
    {
        return folder.path() + L"\\" + name;
    }
    // Puts a message catalogue of one text in force.
    void translate(const std::string& text, const std::string& translation) const
    {
        // The file form of gettext: a header, the length and offset of either text, the texts.
        const auto length = static_cast<unsigned>(text.size()), after = static_cast<unsigned>(translation.size());
        const unsigned head[] = {0x950412de, 0, 1, 28, 36, 0, 0, length, 44, after, 45 + length};
        CreateDirectoryW(in(L"de").wc_str(), nullptr);
        std::ofstream(in(L"de\\tavi.mo").wc_str(), std::ios::binary)
            << std::string(reinterpret_cast<const char*>(head), sizeof(head)) << text << '\0' << translation << '\0';
        wxFileTranslationsLoader::AddCatalogLookupPathPrefix(folder.path());
        wxTranslations::Set(new wxTranslations);
        wxTranslations::Get()->SetLanguage("de");
        wxTranslations::Get()->AddCatalog("tavi", wxLANGUAGE_ENGLISH);
    }

    LogCapture log;
    InstalledService service;
    TemporaryFolder folder;
};

} // namespace tavi::test
