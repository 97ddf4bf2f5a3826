#include "core/DisplayFormat.h"

#include <vector>

#include <gtest/gtest.h>

namespace tavi {

TEST(DisplayFormat, SizesRatesAndDurations)
{
    const auto texts = [](auto format, const auto& values) {
        wxString all;
        for (const auto value : values)
            all += format(value) + "; ";
        return all;
    };
    // Strict comparisons: a full unit alone stays in the smaller one, but not with rates.
    EXPECT_EQ(texts(formatSize, std::vector<std::int64_t>{0, -1, 1024, 1025, 1048576, 1048577, 1073741824, 1073741825}),
              "0 bytes; -1 bytes; 1024 bytes; 1.0 KB; 1024.0 KB; 1.0 MB; 1024.0 MB; 1.0 GB; ");
    EXPECT_EQ(texts(formatRate, std::vector<std::uint64_t>{0, 1023, 1024, 1048575, 1048576, 1073741824, ~0ull}),
              "0.0 b/s; 1023.0 b/s; 1.0 Kb/s; 1024.0 Kb/s; 1.0 Mb/s; 1.0 Gb/s; 17179869184.0 Gb/s; ");
    const std::vector<std::uint32_t> seconds = {0, 1, 60, 61, 120, 3600, 3601, 7325, 86400, 86401, 90061, 172860, ~0u};
    EXPECT_EQ(texts(formatDuration, seconds),
              "0 seconds; 1 second; 60 seconds; 1 minute, 1 second; 2 minutes; 60 minutes; 1 hour; 2 hours, 2 minutes; "
              "24 hours; 1 day; 1 day, 1 hour; 2 days; 49710 days, 6 hours; ");
}

TEST(DisplayFormat, DateTimePatterns)
{
    EXPECT_EQ(dateTimePattern("h:mm:ss tt", ":", "M/d/yyyy"), "%m/%d/%Y %I:%M %p");
    EXPECT_EQ(dateTimePattern("H.mm.ss", ".", "yy-MMM-dd"), "%y-%b-%d %H.%M");
    EXPECT_EQ(dateTimePattern("tt hh:mm", ":", "dddd d MMMM yyyy"), "%A %d %B %Y %p %I:%M");
    EXPECT_EQ(dateTimePattern("HH:mm:ss:ss", ":", "ddd d.M.y"), "%a %d.%m.y %H:%M:%S");
}

} // namespace tavi
