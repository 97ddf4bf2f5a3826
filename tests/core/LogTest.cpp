#include "core/Log.h"

#include <regex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <wx/log.h>
#include <wx/textfile.h>

#include "core/Boundary.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

// The lines with "@" for their times, while the log is still open: what is written must be there at once.
std::vector<std::string> linesOf(const std::wstring& path)
{
    wxTextFile file;
    EXPECT_TRUE(file.Open(path));
    const std::regex time("^\\d\\d[A-Z][a-z]{2}\\d{4} \\d\\d:\\d\\d:\\d\\d: ");
    std::vector<std::string> lines;
    for (std::size_t line = 0; line < file.GetLineCount(); ++line)
        lines.push_back(std::regex_replace(toUtf8(view(file[line])), time, "@ "));
    return lines;
}

TEST(Log, LinesOfAnyThreadReachTheFileAtOnceOrThePreviousTarget)
{
    const unsigned long levelBefore = wxLog::GetLogLevel();
    test::InstalledService service;
    ASSERT_TRUE(OpenLog(3));

    std::thread([] { wxLogWarning("from a thread: %d", 7); }).join();
    wxLogInfo("Attaching to %s", "nobody");
    wxLogError("%s", wxString(L'x', 5000));
    guarded("an entry", [] { throw std::runtime_error("what it said"); });
    EXPECT_EQ(guarded("another", 4, []() -> int { throw 1; }), 4);
    const std::vector<std::string> expected = {"@ Warning: from a thread: 7", "@ Error: " + std::string(4095, 'x'),
                                               "@ Error: Unhandled exception in an entry: what it said",
                                               "@ Error: Unhandled exception in another"};
    EXPECT_EQ(linesOf(service.file(L"tavi.log")), expected);

    const auto write = [] {
        for (int i = 0; i < 50; ++i) {
            wxLogError("%s.", wxString(L'm', 1000));
            const LogSilencer silence; // overlapping silences must not leave the log off
        }
    };
    std::thread writers[] = {std::thread(write), std::thread(write), std::thread(write), std::thread(write)};
    for (std::thread& writer : writers)
        writer.join();
    EXPECT_TRUE(wxLog::IsEnabled());
    // A line that falls into another thread's silence is dropped, never cut.
    const auto lines = linesOf(service.file(L"tavi.log"));
    EXPECT_GE(lines.size(), expected.size() + 50);
    for (std::size_t line = expected.size(); line < lines.size(); ++line)
        EXPECT_EQ(lines[line], "@ Error: " + std::string(1000, 'm') + ".");
    // Wherever memory runs out the boundary holds.
    for (int succeeding = 0; succeeding < 100; ++succeeding) {
        const test::FailingAllocations few(succeeding);
        guarded("need", [] { throw std::runtime_error("is known"); });
    }
    EXPECT_EQ(linesOf(service.file(L"tavi.log")).back(), "@ Error: Unhandled exception in need: is known");
    CloseLog();
    EXPECT_TRUE(DeleteFileW(service.file(L"tavi.log").c_str()));

    // Without a file the previous target goes on.
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    test::LogCapture log;
    wxLog* const target = wxLog::GetActiveTarget();
    EXPECT_TRUE(OpenLog(3));
    EXPECT_EQ(wxLog::GetActiveTarget(), target);
    EXPECT_NE(log.take().at(0).find("Unable to open logfile C:\\no such folder\\tavi.log"), std::string::npos);
    // Without any target a line is dropped: the library would else make one that opens a message box in the host.
    wxLog::SetActiveTarget(nullptr);
    wxLogError("dropped");
    EXPECT_EQ(wxLog::GetActiveTarget(), nullptr);
    wxLog::SetActiveTarget(target);
    wxLog::SetLogLevel(levelBefore);
}

TEST(Log, WaitsThirtySecondsForTheDataDirectory)
{
    test::InstalledService service;
    service.install().DeleteValue(L"DataPath");
    test::LogCapture log;
    wxLog* const target = wxLog::GetActiveTarget();
    for (const std::size_t installedAfter : {31u, 30u}) {
        std::vector<unsigned long> sleeps;
        const bool opened = OpenLog(wxLOG_Max, [&](unsigned long milliseconds) {
            sleeps.push_back(milliseconds);
            if (sleeps.size() == installedAfter)
                service.install().SetValue(L"DataPath", wxString(service.file(L"")));
        });
        EXPECT_EQ(sleeps, std::vector<unsigned long>(30, 1000));
        EXPECT_EQ(opened, installedAfter == 30);
        EXPECT_EQ(wxLog::GetActiveTarget() != target, opened);
    }
    CloseLog();
}

} // namespace
} // namespace tavi
