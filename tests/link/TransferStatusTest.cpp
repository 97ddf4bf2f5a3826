#include "link/TransferStatus.h"

#include <cmath>
#include <sstream>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace tavi {
namespace {

std::atomic<std::uint32_t> now{0};
std::uint32_t tick()
{
    return now;
}

MessageText text(const wxString& content)
{
    return std::make_shared<const wxString>(content);
}

void event(TransferStatus& status, std::uint32_t type, std::uint64_t value = 0, std::uint32_t flag = 0,
           const wxString& content = wxString())
{
    status.apply(EventMessage(type, 0, value, flag, text(content)));
}

// Whatever is set, by name; names in the order of the fields.
std::string shown(const TransferStatus& status)
{
    std::ostringstream out;
    const auto add = [&](const char* name, auto value) {
        if (value != decltype(value){})
            out << name << '=' << value << ' ';
    };
    add("A", status.statusTextA.get().utf8_string());
    add("B", status.statusTextB.get().utf8_string());
    add("text", status.restoreText.get().utf8_string());
    // 1 ms more than the youngest sample's age takes in every sample.
    add("ringA", status.ringA.rateOver(100000) * 1000);
    add("ringB", status.ringB.rateOver(100000) * 1000);
    add("ring", status.restoreRing.rateOver(100000) * 1000);
    add("short", status.restoreRateShort.load());
    add("long", status.restoreRateLong.load());
    add("unused", status.rate0 + status.rate1 + status.rate2);
    add("totalA", status.totalA.load());
    add("totalB", status.totalB.load());
    add("total", status.restoreTotal.load());
    add("doneA", status.doneA.load());
    add("doneB", status.doneB.load());
    add("done", status.restoreDone.load());
    const std::pair<const char*, bool> flags[] = {{"ended", status.ended},     {"started", status.restoreStarted},
                                                  {"ended3", status.ended3},   {"34", status.switch34},
                                                  {"32", status.switch32},     {"39", status.switch39},
                                                  {"24", status.switch24},     {"mark", status.mark10},
                                                  {"ended10", status.ended10}, {"ended4", status.ended4},
                                                  {"ended6", status.ended6},   {"ended8", status.ended8},
                                                  {"ended5", status.ended5},   {"ended9", status.ended9}};
    for (const auto& [name, on] : flags)
        out << (on ? std::string(name) + " " : "");
    return out.str();
}

// Everything that an event can set is set.
void fill(TransferStatus& status)
{
    for (const std::uint32_t outcome : {3u, 4u, 5u, 6u, 8u, 9u, 10u})
        event(status, outcome);
    for (auto* const flag :
         {&status.ended3, &status.ended4, &status.ended5, &status.ended6, &status.ended8, &status.ended9})
        *flag = true;
    event(status, 51);
    for (auto* const rate :
         {&status.rate0, &status.rate1, &status.rate2, &status.restoreRateShort, &status.restoreRateLong})
        *rate = 1;
    for (const std::uint32_t on : {24u, 32u, 34u, 39u})
        event(status, on);
    event(status, 11, 0, 0, L"a");
    event(status, 13, 0, 0, L"b");
    event(status, 54, 0, 0, L"t");
    event(status, 18, 100);
    event(status, 19, 200);
    event(status, 53, 300);
    now += 1000;
    event(status, 16, 10);
    event(status, 17, 20, 1);
    event(status, 56, 30);
}

const char* const kRestore = "text=t ring=30 short=1 long=1 total=300 done=30 started ";
const char* const kFull =
    "A=a B=b text=t ringA=10 ringB=20 ring=30 short=1 long=1 unused=3 totalA=100 totalB=200 total=300 "
    "doneA=10 doneB=20 done=30 ended started ended3 34 32 39 24 mark ended10 ended4 ended6 ended8 "
    "ended5 ended9 ";

std::string without(std::string all, const std::vector<std::string>& gone)
{
    for (const std::string& name : gone)
        all.erase(all.find(name + " "), name.size() + 1);
    return all;
}

TEST(TransferStatus, EveryEventHasItsEffect)
{
    const std::string full = kFull, restore = kRestore;
    const auto ended = [&](const std::string& outcome) {
        return without(restore, {"started"}) + "ended started " + outcome;
    };
    std::vector<std::string> expected(58, full);
    expected[0] = expected[2] = ended("");
    expected[1] = restore;
    expected[3] = ended("ended3 ");
    expected[4] = ended("ended4 ");
    expected[5] = ended("ended5 ");
    expected[6] = ended("ended6 ");
    expected[8] = ended("ended8 ");
    expected[9] = ended("ended9 ");
    expected[10] = "text=t ring=30 short=1 long=1 totalA=500 totalB=500 total=300 done=30 ended started mark ended10 ";
    const auto replaced = [&](const std::string& from, const std::string& to) {
        std::string changed = full;
        return changed.replace(changed.find(from + " "), from.size() + 1, to.empty() ? to : to + " ");
    };
    expected[11] = replaced("A=a", "A=new");
    expected[12] = replaced("A=a", "");
    expected[13] = replaced("B=b", "B=new");
    expected[14] = replaced("B=b", "");
    // The sample takes another 1000 ms; the sum is cut to the total.
    expected[16] = without(replaced("doneA=10", "doneA=100"), {}).replace(full.find("ringA=10"), 8, "ringA=255");
    expected[17] = replaced("doneB=20", "doneB=200"); // no flag: no sample
    expected[18] = replaced("totalA=100", "totalA=600");
    expected[19] = replaced("totalB=200", "totalB=700");
    expected[25] = without(full, {"24"});
    expected[33] = without(full, {"32"});
    expected[35] = without(full, {"34"});
    expected[36] = without(full, {"mark"});
    expected[40] = without(full, {"39"});
    const std::vector<std::string> restoreOnly = {"text=t", "ring=30", "short=1", "long=1", "total=300", "done=30"};
    expected[51] = without(full, restoreOnly);
    expected[52] = without(expected[51], {"started"});
    expected[53] = replaced("total=300", "total=500");
    expected[54] = replaced("text=t", "text=new");
    expected[55] = without(full, {"text=t"});
    expected[56] = replaced("done=30", "done=300").replace(full.find("ring=30"), 7, "ring=265");
    expected[57] = replaced("total=300", "total=800");
    for (std::uint32_t type = 0; type < expected.size(); ++type) {
        TransferStatus status(true, tick);
        fill(status);
        ASSERT_EQ(shown(status), full);
        now += 1000;
        event(status, type, 500, 0, L"new");
        EXPECT_EQ(shown(status), expected[type]) << "type " << type;
    }
}

TEST(TransferStatus, EverySnapshotHasItsEffect)
{
    const std::string amounts = "totalA=1 totalB=200 total=300 doneA=2 doneB=4 done=30 ", flags = "34 32 39 24 ";
    const std::pair<std::uint32_t, std::string> cases[] = {
        {0, amounts + "ended " + flags},
        {1, "total=300 done=30 "},
        {2, amounts + "ended ended3 " + flags},
        {3, amounts + "ended ended3 " + flags},
        {4, amounts + "ended " + flags + "ended4 "},
        {5, amounts + "ended " + flags + "ended5 "},
        {6, amounts + "ended " + flags + "ended6 "},
        {7, amounts + flags},
        {8, amounts + "ended " + flags + "ended8 "},
        {9, amounts + "ended " + flags + "ended9 "},
        {10, amounts + "ended " + flags + "mark ended10 "},
        {51, amounts + "started " + flags},
        {52, "totalA=1 totalB=200 doneA=2 doneB=4 " + flags},
        {99, amounts + flags},
    };
    for (const auto& [state, expected] : cases) {
        TransferStatus status(true, tick);
        fill(status);
        for (auto* const flag :
             {&status.ended, &status.ended3, &status.ended4, &status.ended5, &status.ended6, &status.ended8,
              &status.ended9, &status.ended10, &status.mark10, &status.restoreStarted})
            *flag = false;
        status.apply(SnapshotMessage(state, 1, 2, 3, 4));
        EXPECT_EQ(shown(status), expected) << "state " << state;
    }
}

TEST(TransferStatus, AmountsThatMakeNoSenseStayDefined)
{
    TransferStatus status(false, tick);
    event(status, 57, UINT64_MAX);
    event(status, 57, 1);
    EXPECT_EQ(status.restoreTotal, 0);
    event(status, 53, 1ull << 63);
    event(status, 56, 5);
    EXPECT_EQ(status.restoreDone, INT64_MIN); // the sum is larger than the total
    event(status, 53, 1);
    EXPECT_EQ(status.barPosition(), INT32_MIN);
    EXPECT_EQ(status.restoreRing.rateOver(5000), 0); // not sampling
}

TEST(TransferStatus, RatesAndEstimatesFollowTheClock)
{
    // Starts shortly before the tick count wraps.
    now = UINT32_MAX - 700;
    TransferStatus status(true, tick);
    const auto quarter = [&](int count) {
        for (; count > 0; --count) {
            now += 250;
            status.timerTick();
        }
    };
    event(status, 51);
    quarter(3);
    EXPECT_EQ(status.restoreRing.rateOver(5000), 0);
    EXPECT_EQ(status.restoreSpeed(), 0u);
    EXPECT_EQ(status.barPosition(), 0);
    now += 125;
    event(status, 53, 4 << 20);
    event(status, 56, 1 << 20);
    quarter(17);
    EXPECT_EQ(status.restoreSpeed(), 1636801u) << "1048576 bytes in a life of 5125 ms";
    EXPECT_EQ(status.barPosition(), 62);
    EXPECT_FALSE(status.remainingSeconds()) << "the first long rate comes after ten seconds";
    quarter(20);
    EXPECT_FLOAT_EQ(status.restoreRateLong, 828504.5f) << "1048576 bytes in 10125 ms";
    EXPECT_EQ(status.remainingSeconds(), 30u) << "for another 3 MiB";
    EXPECT_EQ(status.restoreSpeed(), 0u) << "nothing came in the last 5000 ms";

    const std::pair<float, std::optional<std::uint32_t>> rates[] = {
        {999.0f, std::nullopt}, {1000.0f, 25165u},   {0.0f, std::nullopt}, {-1e9f, std::nullopt},
        {INFINITY, 0u},         {NAN, std::nullopt}, {1e6f, 25u},          {1000.9f, 25165u}};
    for (const auto& [rate, seconds] : rates) {
        status.restoreRateLong = rate;
        EXPECT_EQ(status.remainingSeconds(), seconds) << rate;
    }
    // The quotient keeps 32 bits; one value of them stands for unknown.
    status.restoreRateLong = 8000;
    for (const auto& [total, seconds] : {std::pair(0x100000001ull * 1000, std::optional(1u)),
                                         std::pair(0xffffffffull * 1000, std::optional<std::uint32_t>())}) {
        event(status, 53, total + (1 << 20));
        EXPECT_EQ(status.remainingSeconds(), seconds);
    }
    // What is finished has no speed.
    event(status, 53, 1 << 20);
    status.restoreRateShort = 5;
    quarter(40);
    EXPECT_EQ(status.restoreRateShort + status.restoreRateLong, 0);
    EXPECT_EQ(status.barPosition(), TransferStatus::kBarRange);
}

TEST(RateRing, CountsItsNewestSamples)
{
    const struct {
        int capacity, samples, span;
        double rate;
    } cases[] = {
        {8, 3, 200, 2.5 / 100},  // the last two: 2 and 3
        {8, 3, 201, 2.0 / 100},  // and the one before
        {8, 3, 9999, 2.0 / 100}, // 1, 2 and 3
        {4, 4, 9999, 3.0 / 100}, // just wrapped: the slot that comes next does not count
        {4, 9, 9999, 8.0 / 100}, {8, 8, 100, 8.0 / 100}, {1, 5, 9999, 0}, {8, 3, 0, 0}, {8, 3, -5, 0}, {8, 0, 100, 0},
    };
    for (const auto& test : cases) {
        RateRing ring(test.capacity, tick);
        for (int sample = 1; sample <= test.samples; ++sample) {
            now += 100;
            ring.addSample(static_cast<std::uint64_t>(sample));
        }
        EXPECT_DOUBLE_EQ(ring.rateOver(test.span), test.rate)
            << test.capacity << ' ' << test.samples << ' ' << test.span;
        now += 5000;
        ring.clearRing();
        ring.addSample(7);
        EXPECT_EQ(ring.rateOver(1000), 0) << "no time has passed since the clear";
    }
}

// The listener, a window's thread and a reader at once: the thread sanitizer sees any touch without order, the address
// sanitizer any of a freed text.
TEST(TransferStatus, IsReadWhileItChanges)
{
    TransferStatus status(true, tick);
    std::atomic<bool> done{false};
    std::atomic<int> torn{0};
    std::thread listener([&] {
        for (std::uint32_t round = 0; round < 2000; ++round) {
            event(status, 51 + round % 7, 1000 + round % 50, 1,
                  wxString(static_cast<wchar_t>(L'a' + round % 26), round % 40));
            if (round % 500 == 0)
                status.apply(SnapshotMessage(51, 1, 2, 3, 4));
        }
        done = true;
    });
    std::thread window([&] {
        while (!done) {
            ++now;
            status.timerTick();
            status.remainingSeconds();
            status.barPosition();
            status.restoreSpeed();
            status.restoreRing.clearRing();
        }
    });
    while (!done) {
        const wxString whole = status.restoreText.get();
        torn += whole.empty() || whole == wxString(whole[0], whole.length()) ? 0 : 1;
    }
    listener.join();
    window.join();
    EXPECT_EQ(torn, 0);
}

} // namespace
} // namespace tavi
