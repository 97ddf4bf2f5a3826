#include "core/Log.h"

#include <algorithm>
#include <fstream>
#include <regex>
#include <thread>

#include <gtest/gtest.h>

#include "core/Boundary.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

// Returns the lines with "@" for their times. The log is still open: each line is in the file at once.
std::vector<std::string> linesOf(const std::wstring& path)
{
    std::ifstream file(toUtf8(path));
    const std::regex time("^\\d\\d[A-Z][a-z]{2}\\d{4} \\d\\d:\\d\\d:\\d\\d: ");
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);)
        lines.push_back(std::regex_replace(line, time, "@ "));
    return lines;
}

struct Log : testing::Test {
    ~Log() override
    {
        closeLog();
        wxLog::SetLogLevel(levelBefore);
    }
    const unsigned long levelBefore = wxLog::GetLogLevel();
    test::InstalledService service;
    const std::wstring path = service.file(L"tavi.log");
};

TEST_F(Log, LinesAreInTheFileAtOnce)
{
    ASSERT_TRUE(openLog(3));
    wxLogWarning("at once: %d", 7);
    wxLogInfo("Attaching to %s", "nobody");
    wxLogError("%s", wxString(L'x', 5000));
    EXPECT_EQ(guarded("another", 4, []() -> int { throw 1; }), 4);
    EXPECT_EQ(linesOf(path), (std::vector<std::string>{"@ Warning: at once: 7", "@ Error: " + std::string(4095, 'x'),
                                                       "@ Error: Unhandled exception in another"}));
    closeLog();
    EXPECT_TRUE(DeleteFileW(path.c_str()));
}

TEST_F(Log, LinesOfManyThreadsStayWhole)
{
    ASSERT_TRUE(openLog(3));
    std::thread threads[3];
    for (std::thread& thread : threads)
        thread = std::thread([] {
            for (int i = 0; i < 50; ++i)
                wxLogError("%s.", wxString(L'm', 1000));
        });
    for (std::thread& thread : threads)
        thread.join();
    const auto lines = linesOf(path);
    EXPECT_EQ(std::count(lines.begin(), lines.end(), "@ Error: " + std::string(1000, 'm') + "."), 150);
}

TEST_F(Log, BoundaryHoldsIfMemoryRunsOut)
{
    ASSERT_TRUE(openLog(3));
    for (int succeeding = 0; succeeding < 100; ++succeeding) {
        const test::FailingAllocations few(succeeding);
        guarded("need", [] { throw std::runtime_error("is known"); });
    }
    EXPECT_EQ(linesOf(path).back(), "@ Error: Unhandled exception in need: is known");
}

TEST_F(Log, KeepsThePreviousTargetIfTheFileCannotBeOpened)
{
    {
        const LogSilencer outer, inner;
    }
    EXPECT_TRUE(wxLog::IsEnabled()) << "silencers that overlap must not leave the log off";
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    test::LogCapture log;
    wxLog* const target = wxLog::GetActiveTarget();
    EXPECT_TRUE(openLog(3));
    EXPECT_NE(log.take().at(0).find("Unable to open logfile C:\\no such folder\\tavi.log"), std::string::npos);
    // wxWidgets' own target would open a message box in the host.
    wxLog::SetActiveTarget(nullptr);
    EXPECT_EQ(wxLog::GetActiveTarget(), nullptr);
    wxLog::SetActiveTarget(target);
}

TEST_F(Log, WaitsThirtySecondsForTheDataDirectory)
{
    service.install().DeleteValue(L"DataPath");
    for (const std::size_t installedAfter : {31u, 30u}) {
        std::vector<unsigned long> sleeps;
        const auto sleep = [&](unsigned long milliseconds) {
            sleeps.push_back(milliseconds);
            if (sleeps.size() == installedAfter)
                service.install().SetValue(L"DataPath", wxString(service.file(L"")));
        };
        EXPECT_EQ(openLog(wxLOG_Max, sleep), installedAfter == 30);
        EXPECT_EQ(sleeps, std::vector<unsigned long>(30, 1000));
    }
}

} // namespace
} // namespace tavi
