#include "core/DisplayFormat.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(DisplayFormat, Sizes)
{
    const struct {
        std::int64_t bytes;
        const wchar_t* text;
    } cases[] = {{0, L"0 bytes"},         {-1, L"-1 bytes"},
                 {1024, L"1024 bytes"}, // a threshold stays in the smaller unit
                 {1025, L"1.0 KB"},       {1048576, L"1024.0 KB"},
                 {1048577, L"1.0 MB"},    {1073741824, L"1024.0 MB"},
                 {1073741825, L"1.0 GB"}, {5497558138880, L"5120.0 GB"}};
    for (const auto& test : cases)
        EXPECT_EQ(FormatSize(test.bytes), test.text);
}

TEST(DisplayFormat, Rates)
{
    const struct {
        std::uint64_t amount;
        const wchar_t* text;
    } cases[] = {
        {0, L"0.0 b/s"},        {1023, L"1023.0 b/s"},     {1024, L"1.0 Kb/s"},           {1048575, L"1024.0 Kb/s"},
        {1048576, L"1.0 Mb/s"}, {1073741824, L"1.0 Gb/s"}, {~0ull, L"17179869184.0 Gb/s"}};
    for (const auto& test : cases)
        EXPECT_EQ(FormatRate(test.amount), test.text);
}

TEST(DisplayFormat, Durations)
{
    const struct {
        std::uint32_t seconds;
        const wchar_t* text;
    } cases[] = {{0, L"0 seconds"},
                 {1, L"1 second"},
                 {60, L"60 seconds"}, // strict comparisons: a full unit alone stays in the smaller one
                 {61, L"1 minute, 1 second"},
                 {120, L"2 minutes"},
                 {3600, L"60 minutes"},
                 {3601, L"1 hour"},
                 {7325, L"2 hours, 2 minutes"},
                 {86400, L"24 hours"},
                 {86401, L"1 day"},
                 {90061, L"1 day, 1 hour"},
                 {172800 + 60, L"2 days"},
                 {4294967295u, L"49710 days, 6 hours"}};
    for (const auto& test : cases)
        EXPECT_EQ(FormatDuration(test.seconds), test.text) << test.seconds;
}

TEST(DisplayFormat, DateTimePatterns)
{
    const struct {
        const wchar_t *time, *separator, *date, *pattern;
    } cases[] = {{L"h:mm:ss tt", L":", L"M/d/yyyy", L"%m/%d/%Y %I:%M %p"},
                 {L"HH:mm:ss", L":", L"dd.MM.yyyy", L"%d.%m.%Y %H:%M"},
                 {L"H.mm.ss", L".", L"yy-MMM-dd", L"%y-%b-%d %H.%M"},
                 {L"tt hh:mm", L":", L"dddd d MMMM yyyy", L"%A %d %B %Y %p %I:%M"},
                 {L"HH:mm:ss:ss", L":", L"ddd d.M.y", L"%a %d.%m.y %H:%M:%S"}};
    for (const auto& test : cases)
        EXPECT_EQ(dateTimePattern(test.time, test.separator, test.date), test.pattern);
}

} // namespace
} // namespace tavi
