#include "core/Log.h"

#include <fstream>
#include <regex>

#include <gtest/gtest.h>

#include "core/Boundary.h"
#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;

namespace {

// Returns the content with "@" for the times. The log is still open: each line is in the file at once.
std::string contentOf(const std::wstring& path)
{
    std::ifstream file(toUtf8(path));
    const std::string content(std::istreambuf_iterator<char>(file), {});
    return std::regex_replace(content, std::regex("\\d\\d[A-Z][a-z]{2}\\d{4} \\d\\d:\\d\\d:\\d\\d: "), "@ ");
}

struct Log : testing::Test {
    ~Log() override
    {
        closeLog();
    }
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
    EXPECT_EQ(contentOf(path), "@ Warning: at once: 7\n@ Error: " + std::string(4095, 'x') +
                                   "\n@ Error: Unhandled exception in another\n");
    closeLog();
    EXPECT_TRUE(DeleteFileW(path.c_str()));
}

TEST_F(Log, BoundaryHoldsIfMemoryRunsOut)
{
    ASSERT_TRUE(openLog(3));
    for (int succeeding = 0; succeeding < 100; ++succeeding) {
        const test::FailingAllocations few(succeeding);
        guarded("need", [] { throw std::runtime_error("is known"); });
    }
    EXPECT_TRUE(wxString(contentOf(path)).EndsWith("@ Error: Unhandled exception in need: is known\n"));
}

TEST_F(Log, KeepsThePreviousTargetIfTheFileCannotBeOpened)
{
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    test::LogCapture log;
    std::pair<LogSilencer, LogSilencer>(); // those that overlap must not leave the log off
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

} // namespace
