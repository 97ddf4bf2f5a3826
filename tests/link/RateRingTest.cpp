#include "link/RateRing.h"

#include <tuple>

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(RateRing, CountsItsNewestSamples)
{
    static std::uint32_t now = 0;
    // Samples of 1, 2, 3 and so on every 100 ms into a ring of that capacity; the rate over the span.
    const std::tuple<int, int, int, double> cases[] = {
        {8, 3, 200, 2.5 / 100}, {8, 3, 201, 2.0 / 100},
        {8, 8, 100, 8.0 / 100}, {4, 9, 9999, 8.0 / 100}, // wrapped: the slot that comes next does not count
        {1, 5, 9999, 0},        {8, 0, 100, 0}};
    for (const auto& [capacity, samples, span, rate] : cases) {
        RateRing ring(capacity, [] { return now; });
        for (int sample = 1; sample <= samples; ++sample) {
            now += 100;
            ring.addSample(static_cast<std::uint64_t>(sample));
        }
        EXPECT_DOUBLE_EQ(ring.rateOver(span), rate) << capacity << ' ' << samples << ' ' << span;
        now += 5000;
        ring.clearRing();
        ring.addSample(7);
        EXPECT_EQ(ring.rateOver(1000), 0) << "no time has passed since the clear";
    }
}

} // namespace
} // namespace tavi
