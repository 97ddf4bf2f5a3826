#include "core/DisplayFormat.h"

#include <gtest/gtest.h>

using namespace tavi;

TEST(DisplayFormat, SizesRatesAndDurations)
{
    const auto texts = [](auto format, auto... values) { return (wxString() + ... + (format(values) + "; ")); };
    // Strict comparisons: a full unit alone stays in the smaller one, but not with rates.
    EXPECT_EQ(texts(formatSize, 0, -1, 1024, 1025, 1048576, 1048577, 1073741824, 1073741825, 5497558138880),
              "0 bytes; -1 bytes; 1024 bytes; 1.0 KB; 1024.0 KB; 1.0 MB; 1024.0 MB; 1.0 GB; 5120.0 GB; ");
    EXPECT_EQ(texts(formatRate, 0u, 1023u, 1024u, 1048575u, 1048576u, 1073741824u, ~0ull),
              "0.0 b/s; 1023.0 b/s; 1.0 Kb/s; 1024.0 Kb/s; 1.0 Mb/s; 1.0 Gb/s; 17179869184.0 Gb/s; ");
    EXPECT_EQ(
        texts(formatDuration, 0u, 1u, 60u, 61u, 120u, 3600u, 3601u, 3661u, 7325u, 86400u, 86401u, 90061u, 172860u, ~0u),
        "0 seconds; 1 second; 60 seconds; 1 minute, 1 second; 2 minutes; 60 minutes; 1 hour; 1 hour, "
        "1 minute; 2 hours, 2 minutes; "
        "24 hours; 1 day; 1 day, 1 hour; 2 days; 49710 days, 6 hours; ");
}

TEST(DisplayFormat, DateTimePatterns)
{
    EXPECT_EQ(dateTimePattern("h:mm:ss tt", ":", "M/d/yyyy"), "%m/%d/%Y %I:%M %p");
    EXPECT_EQ(dateTimePattern("H.mm.ss", ".", "yy-MMM-dd"), "%y-%b-%d %H.%M");
    EXPECT_EQ(dateTimePattern("tt hh:mm", ":", "dddd d MMMM yyyy"), "%A %d %B %Y %p %I:%M");
    EXPECT_EQ(dateTimePattern("HH:mm:ss:ss", ":", "ddd d.M.y"), "%a %d.%m.y %H:%M:%S");
}
