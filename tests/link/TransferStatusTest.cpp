#include "link/TransferStatus.h"

#include <cmath>
#include <map>
#include <set>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using E = EventType;

std::atomic<std::uint32_t> now{0};
std::uint32_t tick()
{
    return now;
}

void apply(TransferStatus& status, EventType type, std::uint64_t value = 0, std::uint32_t flag = 0,
           const wxString& text = "new")
{
    status.apply(*test::event(type, value, text, flag));
}

// Sets every field, the flags as told.
void fill(TransferStatus& s, bool flags)
{
    for (auto* const flag : {&s.ended, &s.ended3, &s.ended4, &s.ended5, &s.ended6, &s.ended8, &s.ended9, &s.ended10,
                             &s.mark10, &s.switch24, &s.switch32, &s.switch34, &s.switch39, &s.restoreStarted})
        *flag = flags;
    std::int64_t value = 0;
    for (auto* const amount : {&s.doneA, &s.totalA, &s.doneB, &s.totalB, &s.restoreDone, &s.restoreTotal})
        *amount = value += 100;
    for (auto* const rate : {&s.rate0, &s.rate1, &s.rate2, &s.restoreRateShort, &s.restoreRateLong})
        *rate = 1;
    for (auto* const text : {&s.statusTextA, &s.statusTextB, &s.restoreText})
        text->set("old");
    now += 9000;
    for (auto* const ring : {&s.ringA, &s.ringB, &s.restoreRing})
        ring->addSample(100);
    now += 1000;
}

// Fields by name: a number, the length of a text, the bytes per second of a ring.
using Picture = std::map<std::string, double>;

Picture pictureOf(const TransferStatus& s)
{
    const auto n = [](const auto& field) { return static_cast<double>(field.load()); };
    const auto ring = [](const RateRing& samples) { return samples.rateOver(9000) * 1000; };
    const auto text = [](const PublishedText& content) { return static_cast<double>(content.get().length()); };
    return {{"textA", text(s.statusTextA)},  {"textB", text(s.statusTextB)},
            {"text", text(s.restoreText)},   {"ringA", ring(s.ringA)},
            {"ringB", ring(s.ringB)},        {"ring", ring(s.restoreRing)},
            {"rate0", n(s.rate0)},           {"rate1", n(s.rate1)},
            {"rate2", n(s.rate2)},           {"short", n(s.restoreRateShort)},
            {"long", n(s.restoreRateLong)},  {"totalA", n(s.totalA)},
            {"totalB", n(s.totalB)},         {"total", n(s.restoreTotal)},
            {"doneA", n(s.doneA)},           {"doneB", n(s.doneB)},
            {"done", n(s.restoreDone)},      {"ended", n(s.ended)},
            {"ended3", n(s.ended3)},         {"ended4", n(s.ended4)},
            {"ended5", n(s.ended5)},         {"ended6", n(s.ended6)},
            {"ended8", n(s.ended8)},         {"ended9", n(s.ended9)},
            {"ended10", n(s.ended10)},       {"mark10", n(s.mark10)},
            {"24", n(s.switch24)},           {"32", n(s.switch32)},
            {"34", n(s.switch34)},           {"39", n(s.switch39)},
            {"started", n(s.restoreStarted)}};
}

const std::set<std::string> kRestore = {"text", "ring", "short", "long", "total", "done", "started"};
const std::set<std::string> kMoving = {"textA", "textB", "text",  "ringA", "ringB", "ring",
                                       "rate0", "rate1", "rate2", "short", "long"};

using Changes = std::multimap<std::uint32_t, std::pair<std::string, double>>;
const Changes kSnapshots = {{2, {"ended3", 1}}, {10, {"mark10", 1}}, {51, {"started", 1}}};
// An amount never exceeds its total, but its sample counts.
const Changes kEvents = {{10, {"mark10", 1}},    {51, {"started", 1}}, {10, {"totalA", 900}}, {10, {"totalB", 900}},
                         {11, {"textA", 3}},     {12, {"textA", 0}},   {13, {"textB", 3}},    {14, {"textB", 0}},
                         {16, {"doneA", 200}},   {16, {"ringA", 100}}, {17, {"doneB", 400}},  {18, {"totalA", 1100}},
                         {19, {"totalB", 1300}}, {24, {"24", 1}},      {25, {"24", 0}},       {32, {"32", 1}},
                         {33, {"32", 0}},        {34, {"34", 1}},      {35, {"34", 0}},       {36, {"mark10", 0}},
                         {39, {"39", 1}},        {40, {"39", 0}},      {53, {"total", 900}},  {54, {"text", 3}},
                         {55, {"text", 0}},      {56, {"done", 600}},  {56, {"ring", 100}},   {57, {"total", 1500}}};

void change(Picture& picture, std::uint32_t code, const Changes& changes)
{
    for (auto [row, end] = changes.equal_range(code); row != end; ++row)
        picture[row->second.first] = row->second.second;
}

TEST(TransferStatus, EveryEventAndSnapshotHasItsEffect)
{
    TransferStatus status(true, tick);
    for (std::uint32_t round = 0; round < 4 * 60; ++round) {
        const std::uint32_t code = round / 4;
        const bool snapshot = round % 2 == 1;
        const bool flags = round % 4 < 2;
        fill(status, flags);
        Picture expected = pictureOf(status);
        if (snapshot)
            change(expected, 0, {{0, {"totalA", 1}}, {0, {"doneA", 2}}, {0, {"doneB", 4}}});
        const bool resetsBackup = snapshot ? code == 1 : code <= 10 && code != 7;
        const bool resetsRestore = code == 52 || (!snapshot && code == 51);
        for (auto& [name, value] : expected) {
            if ((snapshot && kMoving.count(name) == 1) || (kRestore.count(name) == 1 ? resetsRestore : resetsBackup))
                value = 0;
            const bool ends = name == "ended" && code <= 10 && code != 1 && code != 7;
            if (ends || name == "ended" + std::to_string(code))
                value = 1;
        }
        if (snapshot) {
            change(expected, code, kSnapshots);
            status.apply(SnapshotMessage(code, 1, 2, 3, 4));
        } else {
            change(expected, code, kEvents);
            // Its flag tells whether there is a sample.
            if (code == 17 && flags)
                expected["ringB"] = 100;
            apply(status, E{code}, 900, flags ? 1 : 0);
        }
        EXPECT_EQ(pictureOf(status), expected) << (snapshot ? "snapshot " : "event ") << code;
    }
}

TEST(TransferStatus, AmountsThatMakeNoSenseStayDefined)
{
    TransferStatus status(false, tick);
    apply(status, E::restoreMore, UINT64_MAX);
    apply(status, E::restoreMore, 1);
    EXPECT_EQ(status.restoreTotal, 0);
    apply(status, E::restoreTotal, 1ull << 63);
    apply(status, E::restoreDone, 5);
    EXPECT_EQ(status.restoreDone, INT64_MIN) << "the sum is larger than the total";
    apply(status, E::restoreTotal, 1);
    EXPECT_EQ(status.barPosition(), INT32_MIN);
}

TEST(TransferStatus, RatesAndEstimatesFollowTheClock)
{
    // Starts shortly before the tick count wraps.
    now = UINT32_MAX - 700;
    TransferStatus status(true, tick);
    // Total, amount added, ticks of 250 ms; speed, position and estimate after them.
    const std::tuple<std::uint64_t, std::uint64_t, int, std::uint64_t, int, std::optional<std::uint32_t>> steps[] = {
        {4 << 20, 1 << 20, 3, 0, 62, {}},
        {4 << 20, 0, 1, 8388608, 62, {}},
        {4 << 20, 0, 12, 2097152, 62, {}},
        // Nothing came in the last 5000 ms; the first long rate comes after 10 s.
        {4 << 20, 0, 23, 0, 62, {}},
        {4 << 20, 0, 1, 0, 62, 30},
        // Finished.
        {1 << 20, 0, 40, 0, 250, {}}};
    for (const auto& [total, added, ticks, speed, position, seconds] : steps) {
        apply(status, E::restoreTotal, total);
        apply(status, E::restoreDone, added);
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
    constexpr std::uint64_t mebibytes = 3 << 20;
    const std::tuple<std::uint64_t, float, std::optional<std::uint32_t>> cases[] = {
        {mebibytes, 999.0F, {}},
        {mebibytes, 1000.0F, 25165u},
        {mebibytes, 1000.9F, 25165u},
        {mebibytes, -1e9F, {}},
        {mebibytes, NAN, {}},
        {mebibytes, INFINITY, 0u},
        // The quotient keeps 32 bits; one value of them stands for unknown.
        {0x100000001ull * 1000, 8000.0F, 1u},
        {0xffffffffull * 1000, 8000.0F, {}}};
    for (const auto& [total, rate, seconds] : cases) {
        apply(status, E::restoreTotal, total);
        status.restoreRateLong = rate;
        EXPECT_EQ(status.remainingSeconds(), seconds) << rate;
    }
}

TEST(RateRing, CountsItsNewestSamples)
{
    // Samples of 1, 2, 3 and so on every 100 ms.
    const std::tuple<int, int, int, double> cases[] = {{8, 3, 200, 2.5 / 100},
                                                       {8, 3, 201, 2.0 / 100},
                                                       {8, 8, 100, 8.0 / 100},
                                                       // Wrapped: the slot that comes next does not count.
                                                       {4, 9, 9999, 8.0 / 100},
                                                       {1, 5, 9999, 0},
                                                       {8, 0, 100, 0}};
    for (const auto& [capacity, samples, span, rate] : cases) {
        RateRing ring(capacity, tick);
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

// The listener and a window's thread at once, for the sanitizers: any access without order, any freed text.
TEST(TransferStatus, IsReadWhileItChanges)
{
    TransferStatus status(true, tick);
    std::atomic<bool> done{false};
    std::thread listener([&] {
        for (std::uint32_t round = 0; round < 100000; ++round) {
            const wxString text(static_cast<wchar_t>(L'a' + round % 26), round % 40 + 1);
            apply(status, E{round % 500 == 0 ? 51 + round / 500 % 7 : 54 + (round % 64 == 63)}, 1000, 1, text);
        }
        status.apply(SnapshotMessage(51, 1, 2, 3, 4));
        done = true;
    });
    while (!done) {
        ++now;
        status.timerTick();
        status.remainingSeconds();
        status.barPosition();
        status.restoreSpeed();
        status.restoreRing.clearRing();
        const wxString text = status.restoreText.get();
        EXPECT_TRUE(text.empty() || text == wxString(text[0], text.length())) << "torn";
    }
    listener.join();
}

} // namespace
} // namespace tavi
