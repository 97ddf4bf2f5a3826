#include "link/RateRing.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(RateRing, CountsItsNewestSamples)
{
    static std::uint32_t now = 0;
    RateRing ring(8, [] { return now; });
    const auto add = [&](std::initializer_list<std::uint64_t> samples) {
        for (const std::uint64_t sample : samples) {
            now += 100;
            ring.addSample(sample);
        }
    };
    EXPECT_EQ(ring.rateOver(100), 0);
    add({1, 2, 3});
    EXPECT_DOUBLE_EQ(ring.rateOver(200), 5.0 / 200);
    EXPECT_DOUBLE_EQ(ring.rateOver(201), 6.0 / 300);
    add({4, 5, 6, 7, 8, 9});
    EXPECT_DOUBLE_EQ(ring.rateOver(9999), 42.0 / 700) << "the slot that comes next does not count";
    ring.clearRing();
    ring.addSample(7);
    EXPECT_EQ(ring.rateOver(1000), 0) << "no time has passed since the clear";
}

} // namespace
} // namespace tavi
