#include "core/DisplayFormat.h"

#include <vector>

#include <gtest/gtest.h>

namespace tavi {
namespace {

template <typename Value>
wxString texts(wxString (*format)(Value), const std::vector<Value>& values)
{
    wxString all;
    for (const Value value : values)
        all += format(value) + "; ";
    return all;
}

TEST(DisplayFormat, SizesRatesAndDurations)
{
    // Strict comparisons: a full unit alone stays in the smaller one, but not with rates.
    EXPECT_EQ(texts(formatSize, {0, -1, 1024, 1025, 1048576, 1048577, 1073741824, 1073741825, 5497558138880}),
              "0 bytes; -1 bytes; 1024 bytes; 1.0 KB; 1024.0 KB; 1.0 MB; 1024.0 MB; 1.0 GB; 5120.0 GB; ");
    EXPECT_EQ(texts(formatRate, {0, 1023, 1024, 1048575, 1048576, 1073741824, ~0ull}),
              "0.0 b/s; 1023.0 b/s; 1.0 Kb/s; 1024.0 Kb/s; 1.0 Mb/s; 1.0 Gb/s; 17179869184.0 Gb/s; ");
    EXPECT_EQ(texts(formatDuration, {0, 1, 60, 61, 120, 3600, 3601, 7325, 86400, 86401, 90061, 172860, 4294967295u}),
              "0 seconds; 1 second; 60 seconds; 1 minute, 1 second; 2 minutes; 60 minutes; 1 hour; 2 hours, 2 minutes; "
              "24 hours; 1 day; 1 day, 1 hour; 2 days; 49710 days, 6 hours; ");
}

TEST(DisplayFormat, DateTimePatterns)
{
    const wchar_t* const cases[][4] = {{L"h:mm:ss tt", L":", L"M/d/yyyy", L"%m/%d/%Y %I:%M %p"},
                                       {L"H.mm.ss", L".", L"yy-MMM-dd", L"%y-%b-%d %H.%M"},
                                       {L"tt hh:mm", L":", L"dddd d MMMM yyyy", L"%A %d %B %Y %p %I:%M"},
                                       {L"HH:mm:ss:ss", L":", L"ddd d.M.y", L"%a %d.%m.y %H:%M:%S"}};
    for (const auto& [time, separator, date, pattern] : cases)
        EXPECT_EQ(dateTimePattern(time, separator, date), pattern);
}

} // namespace
} // namespace tavi
