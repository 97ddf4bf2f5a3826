#include "link/TransferStatus.h"

#include <cmath>
#include <cstring>
#include <thread>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

using namespace tavi;

namespace {

using E = EventType;
using test::event;

std::atomic<std::uint32_t> now{0};

struct Status : TransferStatus {
    Status() : TransferStatus(true, [] { return now.load(); }) {}
    // Returns the fields that are not 0: flags, whether there are texts, amounts, rings by bytes per second, rates.
    std::string contents() const
    {
        const auto field = [](const char* name, std::int64_t value) {
            return value == 0 ? "" : name + (value == 1 ? "" : '=' + std::to_string(value)) + ' ';
        };
        const auto speed = [](const RateRing& ring) { return std::llround(ring.rateOver(1 << 30) * 1000); };
        return field("ended", ended) + field("3", ended3) + field("4", ended4) + field("5", ended5) +
               field("6", ended6) + field("8", ended8) + field("9", ended9) + field("10", ended10) +
               field("mark", mark10) + field("24", switch24) + field("32", switch32) + field("34", switch34) +
               field("39", switch39) + field("textA", !statusTextA.get().empty()) +
               field("textB", !statusTextB.get().empty()) + field("doneA", doneA) + field("totalA", totalA) +
               field("doneB", doneB) + field("totalB", totalB) + field("ringA", speed(ringA)) +
               field("ringB", speed(ringB)) + field("started", restoreStarted) +
               field("item", !restoreText.get().empty()) + field("done", restoreDone) + field("total", restoreTotal) +
               field("ring", speed(restoreRing)) + field("rates", restoreRateShort > 0 && restoreRateLong > 0);
    }
};

TEST(TransferStatus, MessagesChangeTheirFieldsOnly)
{
    const std::string backup = "ended 3 4 5 6 8 9 10 mark 24 32 34 39 textA textB "
                               "doneA=90 totalA=90 doneB=90 totalB=90 ringA=18 ",
                      left = "done=90 total=90 ", restore = "started item " + left + "ring=8 rates ",
                      shot = "24 32 34 39 doneA=2 totalA=5 doneB=4 totalB=90 ";
    const auto snapshot = [](std::uint32_t state) { return std::make_shared<SnapshotMessage>(state, 5, 2, 3, 4); };
    std::vector<std::pair<std::shared_ptr<PipeMessage>, std::string>> cases = {
        {event(E::backupReset), restore},
        {event(E::backupEnded2), "ended " + restore},
        {event(E::backupEnded10, 7), "ended 10 mark totalA=7 totalB=7 " + restore},
        {event(E::doneB, 90), backup + restore}, // beyond the total
        {event(E::doneB, 90, "", 1), backup + "ringB=7 " + restore},
        {event(E::restoreStarted), backup + "started "},
        {event(E::restoreEnded), backup},
        {event(E::restoreTotal, 60), backup + "started item done=90 total=60 ring=8 rates "},
        {event(E::restoreMore, UINT64_MAX), backup + "started item done=90 total=89 ring=8 rates "}, // wraps
        {snapshot(1), left},
        {snapshot(2), "ended 3 " + shot + left},
        {snapshot(7), shot + left},
        {snapshot(10), "ended 10 mark " + shot + left},
        {snapshot(51), shot + "started " + left},
        {snapshot(52), shot},
    };
    for (const unsigned outcome : {3u, 4u, 5u, 6u, 8u, 9u}) {
        const std::string flags = "ended " + std::to_string(outcome) + " ";
        cases.emplace_back(event(E{outcome}), flags + restore);
        cases.emplace_back(snapshot(outcome), flags + shot + left);
    }
    for (const auto& [type, field] : {std::pair(12u, "textA "),
                                      {14u, "textB "},
                                      {25u, "24 "},
                                      {33u, "32 "},
                                      {35u, "34 "},
                                      {36u, "mark "},
                                      {40u, "39 "},
                                      {55u, "item "}}) {
        std::string others = backup + restore;
        cases.emplace_back(event(E{type}), others.erase(others.find(field), std::strlen(field)));
    }
    for (const auto& [message, expected] : cases) {
        Status status;
        for (const unsigned type : {11u, 13u, 18u, 19u, 16u, 17u, 24u, 32u, 34u, 39u, 53u, 56u, 54u}) {
            now += 1000;
            status.apply(*event(E{type}, 90, "new"));
        }
        status.restoreRateShort = status.restoreRateLong = 1;
        // A snapshot sets such flags and clears none.
        for (auto* const flag :
             {&status.ended, &status.ended3, &status.ended4, &status.ended5, &status.ended6, &status.ended8,
              &status.ended9, &status.ended10, &status.mark10, &status.restoreStarted})
            *flag = message->kind() == MessageKind::event;
        status.apply(*message);
        EXPECT_EQ(status.contents(), expected) << static_cast<unsigned>(message->type());
    }
}

TEST(TransferStatus, RatesAndEstimatesFollowTheClock)
{
    now = UINT32_MAX - 700; // the tick count wraps soon
    Status status;
    // The total, the amount added, ticks of 250 ms; after them the speed, position and estimate.
    const std::tuple<std::uint64_t, std::uint64_t, int, std::uint64_t, int, std::optional<std::uint32_t>> steps[] = {
        {4 << 20, 1 << 20, 3, 0, 62, {}},     {4 << 20, 0, 1, 8388608, 62, {}}, // the first short rate
        {4 << 20, 0, 12, 2097152, 62, {}},    {4 << 20, 0, 23, 0, 62, {}},      // nothing came in the last 5000 ms
        {4 << 20, 0, 1, 0, 62, 30},           {1 << 20, 0, 40, 0, 250, {}},     // the first long rate; finished
        {4 << 20, 0, 70000, 0, 62, {}},       {4 << 20, 1 << 20, 4, 1677721, 125, {}}, // the ring has wrapped
        {1ull << 63, 5, 0, 1677721, 250, {}}, {1, 0, 0, 1677721, INT32_MIN, {}}};      // amounts that make no sense
    for (const auto& [total, added, ticks, speed, position, seconds] : steps) {
        status.apply(*event(E::restoreTotal, total));
        status.apply(*event(E::restoreDone, added));
        for (int i = 0; i < ticks; ++i, status.timerTick())
            now += 250;
        EXPECT_EQ(status.restoreSpeed(), speed);
        EXPECT_EQ(status.barPosition(), position);
        EXPECT_EQ(status.remainingSeconds(), seconds);
    }
}

TEST(TransferStatus, EstimatesNeedARateOfAKilobit)
{
    Status status;
    // Total, bits per second and the estimate. Its quotient keeps 32 bits, whose largest number means unknown.
    constexpr std::uint64_t kMany = 3 << 20, kWrapping = 0x100000001ull * 1000, kUnknown = 0xffffffffull * 1000;
    const std::tuple<std::uint64_t, float, std::optional<std::uint32_t>> cases[] = {
        {kMany, 999.0F, {}},   {kMany, 1000.0F, 25165u}, {kMany, 1000.9F, 25165u}, {kMany, NAN, {}},
        {kMany, INFINITY, 0u}, {kWrapping, 8000.0F, 1u}, {kUnknown, 8000.0F, {}}};
    for (const auto& [total, rate, seconds] : cases) {
        status.apply(*event(E::restoreTotal, total));
        status.restoreRateLong = rate;
        EXPECT_EQ(status.remainingSeconds(), seconds) << rate;
    }
}

TEST(TransferStatus, TextsHaveAtMostTheLengthOfAPath)
{
    constexpr std::size_t kLongest = 32767;
    Status status;
    status.apply(*event(E::restoreItem, 0, wxString(L'x', kLongest + 1)));
    EXPECT_EQ(status.restoreText.get(), wxString(L'x', kLongest));
    status.apply(*event(E::textA, 0, wxString(L'x', kLongest - 1) + L"\U0001F4BE"));
    EXPECT_EQ(status.statusTextA.get().length(), sizeof(wchar_t) == 2 ? kLongest - 1 : kLongest) << "no half a pair";
}

TEST(RateRing, CountsTheSamplesSinceTheLastClearOnceTheyAreStored)
{
    RateRing ring(8, [] { return now.load(); });
    const auto addAfterAMillisecond = [&](std::uint64_t amount) {
        ++now;
        ring.addSample(amount);
    };
    addAfterAMillisecond(5);
    now += 100;
    ring.clearRing();
    addAfterAMillisecond(6);
    EXPECT_EQ(ring.rateOver(1000), 6);
    // The amounts grow by 1 with each sample, while this thread reads and clears. A smaller one is of a lap ago.
    std::atomic<unsigned> added{0};
    std::thread writer([&] {
        for (unsigned i = 1; i <= 600000; added = i++)
            addAfterAMillisecond(i);
    });
    int wrong = 0;
    for (unsigned i = 0, before = 0; before < 600000; ++i) {
        if (i % 8 == 0)
            ring.clearRing();
        before = added;
        const double rate = ring.rateOver(2);
        wrong += rate != 0 && rate < before - 1.0 ? 1 : 0;
    }
    writer.join();
    EXPECT_EQ(wrong, 0);
}

} // namespace
