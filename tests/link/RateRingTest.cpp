#include "link/RateRing.h"

#include <thread>

#include <gtest/gtest.h>

using namespace tavi;

namespace {

std::atomic<std::uint32_t> now{0};

struct Ring : RateRing {
    Ring() : RateRing(8, [] { return now.load(); }) {}
    // Adds a sample of one millisecond.
    void add(std::uint64_t amount)
    {
        ++now;
        addSample(amount);
    }
};

TEST(RateRing, CountsAmountsAndTimeSinceTheLastClear)
{
    Ring ring;
    ring.add(5);
    now += 100;
    ring.clearRing();
    EXPECT_EQ(ring.rateOver(1000), 0);
    ring.add(6);
    EXPECT_EQ(ring.rateOver(1000), 6);
}

TEST(RateRing, CountsNoAmountOfALapAgo)
{
    Ring ring;
    // The round in which the newest samples have no amount; 0 at other times.
    std::atomic<int> quietRound{0};
    std::atomic<bool> done{false};
    std::thread writer([&] {
        for (int round = 1; round < 30000; ++round) {
            ring.add(1000);
            for (int i = 0; i < 20; ++i, quietRound = i < 3 ? 0 : round)
                ring.add(0);
            quietRound = 0;
        }
        done = true;
    });
    int wrong = 0;
    while (!done) {
        const int round = quietRound;
        const double rate = ring.rateOver(2);
        wrong += round != 0 && round == quietRound && rate != 0 ? 1 : 0;
    }
    writer.join();
    EXPECT_EQ(wrong, 0);
}

TEST(RateRing, CountsNoAmountWithoutItsTimeBesideAClear)
{
    Ring ring;
    std::atomic<bool> done{false};
    std::thread writer([&] {
        for (int i = 0; i < 500000; ++i)
            ring.add(1);
        done = true;
    });
    double highest = 0;
    while (!done) {
        ring.clearRing();
        for (int i = 0; i < 4; ++i)
            highest = std::max(highest, ring.rateOver(100));
    }
    writer.join();
    EXPECT_LE(highest, 2) << "only the first sample after a clear may have no time";
}

} // namespace
