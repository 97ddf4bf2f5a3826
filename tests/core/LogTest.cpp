#include "core/Log.h"

#include <fstream>
#include <regex>

#include <fcntl.h>
#include <io.h>
#include <winternl.h>
#include <gtest/gtest.h>

#include "core/Boundary.h"
#include "core/LogLine.h"
#include "core/ScopeGuard.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;

namespace {

// Returns the content with "@" for the times and "|" for the ends of lines. The log is still open: each line is in the
// file at once.
std::string contentOf(const std::wstring& path)
{
    std::ifstream file(toUtf8(path), std::ios::binary);
    const std::string content(std::istreambuf_iterator<char>(file), {});
    return std::regex_replace(std::regex_replace(content, std::regex("\r\n"), "|"),
                              std::regex("\\d\\d[A-Z][a-z]{2}20\\d\\d \\d\\d:\\d\\d:\\d\\d: "), "@ ");
}

struct Log : testing::Test {
    test::InstalledService service;
    const std::wstring path = service.file(L"tavi.log");
    const ScopeGuard<void (*)() noexcept> closing{closeLog};
};

TEST_F(Log, LinesAreInTheFileAtOnceInOneEncoding)
{
    ASSERT_EQ(GetACP(), 1252u);
    ASSERT_TRUE(openLog(3));
    logInfo(L"Attaching to %ls", L"nobody");
    logError(L"%ls", std::wstring(5000, L'x').c_str());
    for (const wchar_t* const text : {L"at once", L"\u00E9", L"\u20AC", L"\u00E9\u0416", L"a\xD800z"})
        logWarning(L"%ls", text);
    EXPECT_EQ(guarded("one", 4, []() -> int { throw 1; }), 4);
    guarded("another", [] { throw std::runtime_error("is known"); });
    EXPECT_EQ(contentOf(path), "@ Error: " + std::string(4095, 'x') +
                                   "|@ Warning: at once|@ Warning: \xE9|@ Warning: \x80|@ Warning: \xE9?|"
                                   "@ Warning: a?z|@ Error: Unhandled exception in one|"
                                   "@ Error: Unhandled exception in another: is known|");
    closeLog();
    EXPECT_TRUE(DeleteFileW(path.c_str()));
}

TEST_F(Log, KeepsThePreviousTargetIfTheFileCannotBeOpened)
{
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    test::LogCapture log;
    EXPECT_TRUE(openLog(3));
    EXPECT_NE(log.takeText().find("Unable to open logfile C:\\no such folder\\tavi.log"), std::string::npos);
    wxLog::SetActiveTarget(nullptr);
    EXPECT_FALSE(wxLog::GetActiveTarget()) << "wxWidgets' own target would open a message box in the host";
}

TEST_F(Log, WaitsThirtySecondsForTheDataDirectory)
{
    service.install().DeleteValue(L"DataPath");
    for (const int installedAfter : {31, 30}) {
        int sleeps = 0;
        const auto sleep = [&](unsigned long milliseconds) {
            EXPECT_EQ(milliseconds, 1000u);
            if (++sleeps == installedAfter)
                service.install().SetValue(L"DataPath", wxString(service.file(L"")));
        };
        EXPECT_EQ(openLog(wxLOG_Max, sleep), installedAfter == 30);
        EXPECT_EQ(sleeps, 30);
    }
}

TEST_F(Log, SharesItsFileWithAnotherWriterAndIsNotInherited)
{
    std::ofstream other(toUtf8(path), std::ios::app);
    other << "former\n" << std::flush;
    const int next = _open("NUL", _O_RDONLY);
    _close(next);
    ASSERT_TRUE(openLog(3)); // takes the descriptor that is free again
    logWarning(L"ours");
    other << "theirs\n" << std::flush;
    logWarning(L"last");
    EXPECT_EQ(contentOf(path), "former|@ Warning: ours|theirs|@ Warning: last|");
    // Windows appends at the same instant, too, if the handle has no other right to write. Wine does not.
    const auto log = reinterpret_cast<HANDLE>(_get_osfhandle(next));
    PUBLIC_OBJECT_BASIC_INFORMATION object{};
    EXPECT_EQ(NtQueryObject(log, ObjectBasicInformation, &object, sizeof(object), nullptr), 0);
    EXPECT_EQ(object.GrantedAccess & (FILE_APPEND_DATA | FILE_WRITE_DATA), ACCESS_MASK{FILE_APPEND_DATA});
    DWORD flags = HANDLE_FLAG_INHERIT;
    EXPECT_TRUE(GetHandleInformation(log, &flags));
    EXPECT_EQ(flags & HANDLE_FLAG_INHERIT, 0u) << "a program that the host starts would keep the file open";
}

} // namespace
