#include "core/Log.h"

#include <fstream>
#include <regex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

std::vector<std::string> linesOf(const std::wstring& path)
{
    // Shared for reading while the log is open: what is written must be there at once.
    const KernelHandle file(CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                                        OPEN_EXISTING, 0, nullptr));
    std::string text(1 << 20, '\0');
    DWORD read = 0;
    ReadFile(file.get(), text.data(), static_cast<DWORD>(text.size()), &read, nullptr);
    text.resize(read);
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);)
        lines.push_back(line.back() == '\r' ? line.substr(0, line.size() - 1) : line);
    return lines;
}

TEST(Log, LinesOfAnyThreadReachTheFileAtOnceInTheRequiredForm)
{
    const unsigned long levelBefore = wxLog::GetLogLevel();
    test::InstalledService service;
    ASSERT_TRUE(OpenLog(3));
    const std::wstring path = service.file(L"tavi.log");

    std::thread([] { wxLogWarning("from a thread: %d", 7); }).join();
    wxLogInfo("Attaching to %s", "nobody");
    wxLogError("%s", wxString(L'x', 5000));
    guarded("an entry", [] { throw std::runtime_error("what it said"); });
    EXPECT_EQ(guarded("another", 4, []() -> int { throw 1; }), 4);
    const auto lines = linesOf(path);
    ASSERT_EQ(lines.size(), 4u);
    EXPECT_TRUE(std::regex_match(
        lines[0], std::regex("\\d\\d[A-Z][a-z]{2}\\d{4} \\d\\d:\\d\\d:\\d\\d: Warning: from a thread: 7")))
        << lines[0];
    EXPECT_EQ(lines[1].substr(lines[1].find("Error: ")), "Error: " + std::string(4095, 'x'));
    EXPECT_EQ(lines[2].substr(lines[2].find("Error: ")), "Error: Unhandled exception in an entry: what it said");
    EXPECT_EQ(lines[3].substr(lines[3].find("Error: ")), "Error: Unhandled exception in another");

    std::vector<std::thread> writers;
    for (int writer = 0; writer < 4; ++writer) {
        writers.emplace_back([] {
            for (int i = 0; i < 50; ++i) {
                wxLogError("%s.", wxString(L'm', 1000));
                const LogSilencer silence; // overlapping silences must not leave the log off
            }
        });
    }
    for (std::thread& writer : writers)
        writer.join();
    EXPECT_TRUE(wxLog::IsEnabled());
    const std::string whole = "Error: " + std::string(1000, 'm') + ".";
    int found = 0;
    for (const std::string& line : linesOf(path)) {
        if (line.find("Error: m") != std::string::npos) {
            ++found;
            EXPECT_EQ(line.substr(line.find("Error: ")), whole);
        }
    }
    // A line that falls into another thread's silence is dropped, never cut.
    EXPECT_GE(found, 50);
    CloseLog();
    wxLog::SetLogLevel(levelBefore);
    EXPECT_TRUE(DeleteFileW(path.c_str()));
}

TEST(Log, WithoutAFileThePreviousTargetGoesOn)
{
    const unsigned long levelBefore = wxLog::GetLogLevel();
    test::InstalledService service;
    service.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    test::LogCapture log;
    wxLog* const target = wxLog::GetActiveTarget();
    EXPECT_TRUE(OpenLog(3));
    EXPECT_EQ(wxLog::GetActiveTarget(), target);
    const auto lines = log.take();
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines[0].find("1: "), 0u);
    EXPECT_NE(lines[0].find("Unable to open logfile C:\\no such folder\\tavi.log"), std::string::npos) << lines[0];
    // Without any target a line is dropped: the library would else make one that opens a message box in the host.
    wxLog::SetActiveTarget(nullptr);
    wxLogError("dropped");
    EXPECT_EQ(wxLog::GetActiveTarget(), nullptr);
    wxLog::SetActiveTarget(target);
    wxLog::SetLogLevel(levelBefore);
}

} // namespace
} // namespace tavi
