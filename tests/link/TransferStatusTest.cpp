#include "link/TransferStatus.h"

#include <cmath>
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
        return field("ended", ended) + field("ended3", ended3) + field("mark", mark10) + field("switch", switch24) +
               field("textA", !statusTextA.get().empty()) + field("doneA", doneA) + field("totalA", totalA) +
               field("doneB", doneB) + field("totalB", totalB) + field("ringA", speed(ringA)) +
               field("ringB", speed(ringB)) + field("started", restoreStarted) +
               field("item", !restoreText.get().empty()) + field("done", restoreDone) + field("total", restoreTotal) +
               field("ring", speed(restoreRing)) + field("rates", restoreRateShort > 0 && restoreRateLong > 0);
    }
};

const std::string kBackup = "switch textA doneA=90 totalA=90 doneB=90 totalB=90 ringA=30 ";
const std::string kRestore = "item done=90 total=90 ring=11 rates ";

TEST(TransferStatus, MessagesChangeTheirFieldsOnly)
{
    const auto snapshot = [](std::uint32_t state) { return std::make_shared<SnapshotMessage>(state, 5, 2, 3, 4); };
    const std::string shot = "switch doneA=2 totalA=5 doneB=4 totalB=90 ", left = "done=90 total=90 ";
    const std::tuple<const char*, std::shared_ptr<PipeMessage>, std::string> cases[] = {
        {"reset", event(E::backupReset), kRestore},
        {"end", event(E::backupEnded2), "ended " + kRestore},
        {"end with an outcome", event(E::backupEnded3), "ended ended3 " + kRestore},
        {"end with totals", event(E::backupEnded10, 7), "ended mark totalA=7 totalB=7 " + kRestore},
        {"beyond the total", event(E::doneB, 90), kBackup + kRestore},
        {"sample of B", event(E::doneB, 90, "", 1), kBackup + "ringB=10 " + kRestore},
        {"restore started", event(E::restoreStarted), kBackup + "started "},
        {"restore ended", event(E::restoreEnded), kBackup},
        {"end of item", event(E::restoreItemEnded), kBackup + left + "ring=11 rates "},
        {"new total", event(E::restoreTotal, 60), kBackup + "item done=90 total=60 ring=11 rates "},
        {"larger total", event(E::restoreMore, 60), kBackup + "item done=90 total=150 ring=11 rates "},
        {"total that wraps", event(E::restoreMore, UINT64_MAX), kBackup + "item done=90 total=89 ring=11 rates "},
        {"snapshot of an end", snapshot(2), "ended ended3 " + shot + left},
        {"snapshot with the mark", snapshot(10), "ended mark " + shot + left},
        {"snapshot of a reset", snapshot(1), left},
        {"snapshot of no end", snapshot(7), shot + left},
        {"snapshot of a restore", snapshot(51), shot + "started " + left},
        {"snapshot of its end", snapshot(52), shot},
    };
    for (const auto& [what, message, expected] : cases) {
        Status status;
        for (const E type : {E::moreA, E::moreB, E::doneA, E::doneB, E::textA, E::switch24On, E::restoreTotal,
                             E::restoreDone, E::restoreItem}) {
            now += 1000;
            status.apply(*event(type, 90, "new"));
        }
        status.restoreRateShort = status.restoreRateLong = 1;
        status.apply(*message);
        EXPECT_EQ(status.contents(), expected) << what;
    }
}

TEST(TransferStatus, EachOutcomeAndSwitchHasItsFlag)
{
    using S = TransferStatus;
    // The type that sets the flag, and the one that clears it.
    const std::tuple<E, std::atomic<bool> S::*, E> cases[] = {
        {E::backupEnded3, &S::ended3, E::backupReset},   {E::backupEnded4, &S::ended4, E::backupReset},
        {E::backupEnded5, &S::ended5, E::backupReset},   {E::backupEnded6, &S::ended6, E::backupReset},
        {E::backupEnded8, &S::ended8, E::backupReset},   {E::backupEnded9, &S::ended9, E::backupReset},
        {E::backupEnded10, &S::ended10, E::backupReset}, {E::backupEnded10, &S::mark10, E::mark10Off},
        {E::backupEnded0, &S::ended, E::backupReset},    {E::switch24On, &S::switch24, E::switch24Off},
        {E::switch32On, &S::switch32, E::switch32Off},   {E::switch34On, &S::switch34, E::switch34Off},
        {E::switch39On, &S::switch39, E::switch39Off}};
    for (const auto& [on, flag, off] : cases) {
        Status status;
        status.apply(*event(E::restoreStarted));
        status.apply(*event(on));
        EXPECT_TRUE(status.*flag) << static_cast<std::uint32_t>(on);
        status.apply(*event(off));
        EXPECT_FALSE(status.*flag) << static_cast<std::uint32_t>(off);
        EXPECT_TRUE(status.restoreStarted) << "a backup that starts or ends beside a restore";
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
    for (const auto& [length, kept] : {std::pair(kLongest, kLongest), {kLongest + 1, kLongest}, {1 << 24, kLongest}}) {
        status.apply(*event(E::restoreItem, 0, wxString(L'x', length)));
        EXPECT_EQ(status.restoreText.get(), wxString(L'x', kept));
    }
    status.apply(*event(E::textA, 0, wxString(L'x', kLongest - 1) + L"\U0001F4BE"));
    EXPECT_EQ(status.statusTextA.get().length(), sizeof(wchar_t) == 2 ? kLongest - 1 : kLongest) << "no half a pair";
}

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
