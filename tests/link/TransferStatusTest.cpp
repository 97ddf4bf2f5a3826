#include "link/TransferStatus.h"

#include <cmath>
#include <optional>
#include <thread>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using E = EventType;
using test::event;

std::atomic<std::uint32_t> now{0};
std::uint32_t tick()
{
    return now;
}

// Applies events of these types, one a second, as samples.
void apply(TransferStatus& status, const std::vector<EventType>& types, std::uint64_t value = 90)
{
    for (const EventType type : types) {
        now += 1000;
        status.apply(*event(type, value, "new", 1));
    }
}

// The fields that are not 0: flags, texts by length, amounts, rings by bytes per second, and rates.
std::string contents(const TransferStatus& s)
{
    const char* const names[] = {"ended",  "ended3", "ended4", "ended5", "ended6", "ended8",  "ended9", "ended10",
                                 "mark10", "on24",   "on32",   "on34",   "on39",   "started", "textA",  "textB",
                                 "item",   "doneA",  "totalA", "doneB",  "totalB", "done",    "total",  "ringA",
                                 "ringB",  "ring",   "rate0",  "rate1",  "rate2",  "short",   "long"};
    std::vector<std::int64_t> values;
    for (const auto* flag : {&s.ended, &s.ended3, &s.ended4, &s.ended5, &s.ended6, &s.ended8, &s.ended9, &s.ended10,
                             &s.mark10, &s.switch24, &s.switch32, &s.switch34, &s.switch39, &s.restoreStarted})
        values.push_back(*flag);
    for (const auto* const text : {&s.statusTextA, &s.statusTextB, &s.restoreText})
        values.push_back(static_cast<std::int64_t>(text->get().length()));
    for (const auto* const amount : {&s.doneA, &s.totalA, &s.doneB, &s.totalB, &s.restoreDone, &s.restoreTotal})
        values.push_back(*amount);
    for (const auto* const ring : {&s.ringA, &s.ringB, &s.restoreRing})
        values.push_back(static_cast<std::int64_t>(ring->rateOver(1 << 30) * 1000));
    for (const auto* const rate : {&s.rate0, &s.rate1, &s.rate2, &s.restoreRateShort, &s.restoreRateLong})
        values.push_back(*rate != 0);
    std::string out;
    for (std::size_t i = 0; i < values.size(); ++i)
        out += values[i] == 0 ? "" : names[i] + (values[i] == 1 ? "" : '=' + std::to_string(values[i])) + ' ';
    return out;
}

const std::vector<EventType> kBackup = {E::moreA, E::moreB,      E::doneA,      E::doneB,      E::textA,
                                        E::textB, E::switch24On, E::switch32On, E::switch34On, E::switch39On};
const std::vector<EventType> kRestore = {E::restoreStarted, E::restoreTotal, E::restoreDone, E::restoreItem};
const std::string kAmounts = "doneA=90 totalA=90 doneB=90 totalB=90 ringA=30 ringB=22 ";
const std::string kBackupContents = "on24 on32 on34 on39 textA=3 textB=3 " + kAmounts;

TEST(TransferStatus, EventsChangeTheirFieldsOnly)
{
    const std::tuple<const char*, std::vector<EventType>, std::vector<EventType>, std::string> cases[] = {
        {"nothing", kBackup, {E::ignored7, E::ignored15}, kBackupContents},
        {"off", kBackup, {E::switch24Off, E::switch34Off, E::textBEnded}, "on32 on39 textA=3 " + kAmounts},
        {"other off", kBackup, {E::switch32Off, E::switch39Off, E::textAEnded}, "on24 on34 textB=3 " + kAmounts},
        {"samples beyond the total", {}, {E::doneA, E::doneB}, "ringA=90 ringB=45 "},
        {"totals", {}, {E::moreA, E::moreA, E::moreB}, "totalA=180 totalB=90 "},
        {"end with totals", kBackup, {E::backupEnded10}, "ended ended10 mark10 totalA=90 totalB=90 "},
        {"mark off", {E::backupEnded10}, {E::mark10Off}, "ended ended10 totalA=90 totalB=90 "},
        {"restore", kRestore, {}, "started item=3 done=90 total=90 ring=45 "},
        {"end of item", kRestore, {E::restoreItemEnded}, "started done=90 total=90 ring=45 "},
        {"new total",
         {E::restoreTotal},
         {E::restoreTotal, E::restoreMore, E::restoreDone},
         "done=90 total=180 ring=22 "},
        {"next restore", kRestore, {E::restoreStarted}, "started "},
        {"end of restore", kRestore, {E::restoreEnded}, ""},
    };
    for (const auto& [what, before, types, expected] : cases) {
        TransferStatus status(true, tick);
        apply(status, before);
        apply(status, types);
        EXPECT_EQ(contents(status), expected) << what;
    }
    TransferStatus status(true, tick);
    now += 1000;
    status.apply(*event(E::doneB, 90));
    EXPECT_EQ(contents(status), "") << "without its flag it is no sample";
}

// The flags that the end of a backup sets, by its type; 1 and 7 are no ends.
const std::string kEnds[] = {
    "ended ",        "", "ended ",        "ended ended3 ", "ended ended4 ",        "ended ended5 ",
    "ended ended6 ", "", "ended ended8 ", "ended ended9 ", "ended ended10 mark10 "};

TEST(TransferStatus, TheEndOfABackupLeavesItsOutcomeAndTheRestore)
{
    TransferStatus status(true, tick);
    status.rate0 = status.rate1 = status.rate2 = status.restoreRateShort = status.restoreRateLong = 1;
    apply(status, kBackup);
    apply(status, {E::restoreTotal});
    for (const std::uint32_t type : {10u, 9u, 8u, 6u, 5u, 4u, 3u, 2u, 1u, 0u}) {
        apply(status, {E{type}});
        EXPECT_EQ(contents(status), kEnds[type] + (type == 10 ? "totalA=90 totalB=90 " : "") + "total=90 short long ");
    }
    apply(status, kBackup);
    apply(status, {E::restoreEnded});
    EXPECT_EQ(contents(status), "ended " + kBackupContents);
}

TEST(TransferStatus, SnapshotsReplaceTheState)
{
    for (const std::uint32_t state : {0u, 1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u, 9u, 10u, 51u, 52u}) {
        TransferStatus status(true, tick);
        status.rate0 = status.rate1 = status.rate2 = status.restoreRateShort = status.restoreRateLong = 1;
        apply(status, {E::switch24On, E::moreB, E::textA, E::textB, E::doneA, E::doneB, E::restoreTotal, E::restoreItem,
                       E::restoreDone});
        status.apply(SnapshotMessage(state, 5, 2, 3, 4));
        const std::string flags = state == 51   ? "on24 started "
                                  : state == 52 ? "on24 "
                                                : kEnds[state == 2 ? 3 : state] + "on24 ";
        const std::string backup = flags + "doneA=2 totalA=5 doneB=4 totalB=90 ", restore = "done=90 total=90 ";
        EXPECT_EQ(contents(status), state == 1 ? restore : state == 52 ? backup : backup + restore) << state;
    }
}

TEST(TransferStatus, AmountsThatMakeNoSenseStayDefined)
{
    TransferStatus status(false, tick);
    apply(status, {E::restoreTotal}, 1ull << 63);
    apply(status, {E::restoreDone}, 5);
    EXPECT_EQ(status.restoreDone, INT64_MIN) << "the sum is larger than the total";
    apply(status, {E::restoreTotal}, UINT64_MAX);
    apply(status, {E::restoreMore}, 2);
    EXPECT_EQ(status.barPosition(), INT32_MIN);
    EXPECT_EQ(contents(status).find("ring"), std::string::npos) << "sampling is off";
}

TEST(TransferStatus, RatesAndEstimatesFollowTheClock)
{
    now = UINT32_MAX - 700; // the tick count wraps soon
    TransferStatus status(true, tick);
    // Total, amount added, ticks of 250 ms; speed, position and estimate after them.
    const std::tuple<std::uint64_t, std::uint64_t, int, std::uint64_t, int, std::optional<std::uint32_t>> steps[] = {
        {4 << 20, 1 << 20, 3, 0, 62, {}},  {4 << 20, 0, 1, 8388608, 62, {}}, // the first short rate
        {4 << 20, 0, 12, 2097152, 62, {}}, {4 << 20, 0, 23, 0, 62, {}},      // nothing came in the last 5000 ms
        {4 << 20, 0, 1, 0, 62, 30},                                          // the first long rate
        {1 << 20, 0, 40, 0, 250, {}}};                                       // finished
    for (const auto& [total, added, ticks, speed, position, seconds] : steps) {
        status.apply(*event(E::restoreTotal, total));
        status.apply(*event(E::restoreDone, added));
        for (int i = 0; i < ticks; ++i) {
            now += 250;
            status.timerTick();
        }
        const auto seen = std::tuple(status.restoreSpeed(), status.barPosition(), status.remainingSeconds());
        EXPECT_EQ(seen, std::tuple(speed, position, seconds));
    }
}

TEST(TransferStatus, EstimatesNeedARateOfAKilobit)
{
    TransferStatus status(true, tick);
    // Total, bits per second and the estimate. Its quotient keeps 32 bits, whose largest number means unknown.
    const std::tuple<std::uint64_t, float, std::optional<std::uint32_t>> cases[] = {
        {3 << 20, 999.0F, {}},
        {3 << 20, 1000.0F, 25165u},
        {3 << 20, 1000.9F, 25165u},
        {3 << 20, NAN, {}},
        {3 << 20, INFINITY, 0u},
        {0x100000001ull * 1000, 8000.0F, 1u},
        {0xffffffffull * 1000, 8000.0F, {}}};
    for (const auto& [total, rate, seconds] : cases) {
        apply(status, {E::restoreTotal}, total);
        status.restoreRateLong = rate;
        EXPECT_EQ(status.remainingSeconds(), seconds) << rate;
    }
}

// The listener and a window's thread at once, for the thread sanitizer.
TEST(TransferStatus, IsReadWhileItChanges)
{
    TransferStatus status(true, tick);
    std::thread listener([&] {
        for (std::uint32_t round = 0; round < 50000; ++round)
            status.apply(*event(E{round % 500 == 0 ? 51 : 53 + round % 5}, 1000, wxString(L'a', round % 40), 1));
        status.apply(SnapshotMessage(7, 1, 2, 3, 4));
    });
    while (status.doneB == 0) {
        status.timerTick();
        status.remainingSeconds();
        status.barPosition();
        status.restoreText.get();
        status.restoreRing.clearRing();
    }
    listener.join();
}

} // namespace
} // namespace tavi
