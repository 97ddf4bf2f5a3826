#include "link/TransferStatus.h"

#include <cmath>
#include <map>
#include <sstream>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using test::text;

std::atomic<std::uint32_t> now{0};
std::uint32_t tick()
{
    return now;
}

void event(TransferStatus& status, std::uint32_t type, std::uint64_t value = 0, std::uint32_t flag = 0,
           const wxString& content = wxString())
{
    status.apply(EventMessage(type, 0, value, flag, text(content)));
}

// Whatever is set, by name.
using Picture = std::map<std::string, std::string>;

Picture pictureOf(const TransferStatus& s)
{
    const auto bytes = [](const RateRing& ring) { return ring.rateOver(100000) * 1000; };
    const auto n = [](const auto& field) { return static_cast<double>(field.load()); };
    std::istringstream names("ringA ringB ring short long rates ended started ended3 34 32 39 24 mark ended10 ended4 "
                             "ended6 ended8 ended5 ended9 totalA totalB total doneA doneB done");
    Picture picture;
    for (const double value : {bytes(s.ringA),       bytes(s.ringB),
                               bytes(s.restoreRing), n(s.restoreRateShort),
                               n(s.restoreRateLong), n(s.rate0) + n(s.rate1) + n(s.rate2),
                               n(s.ended),           n(s.restoreStarted),
                               n(s.ended3),          n(s.switch34),
                               n(s.switch32),        n(s.switch39),
                               n(s.switch24),        n(s.mark10),
                               n(s.ended10),         n(s.ended4),
                               n(s.ended6),          n(s.ended8),
                               n(s.ended5),          n(s.ended9),
                               n(s.totalA),          n(s.totalB),
                               n(s.restoreTotal),    n(s.doneA),
                               n(s.doneB),           n(s.restoreDone)}) {
        std::string name;
        names >> name;
        if (value != 0)
            picture[name] = std::to_string(static_cast<int>(value));
    }
    for (const auto& [name, content] :
         {std::pair("A", &s.statusTextA), {"B", &s.statusTextB}, {"text", &s.restoreText}}) {
        if (!content->get().empty())
            picture[name] = content->get().utf8_string();
    }
    return picture;
}

// Changes are words: name=value, -name, or a group of names that go.
Picture changed(Picture picture, const std::string& changes)
{
    const std::map<std::string, std::string> groups = {
        {"-backup", "-A -B -ringA -ringB -rates -totalA -totalB -doneA -doneB -ended -ended3 -34 -32 -39 -24 -mark "
                    "-ended10 -ended4 -ended6 -ended8 -ended5 -ended9"},
        {"-restore", "-text -ring -short -long -total -done -started"},
        {"-moving", "-A -B -text -ringA -ringB -ring -short -long -rates"}};
    std::istringstream words(changes);
    for (std::string word; words >> word;) {
        const std::size_t equals = word.find('=');
        if (const auto group = groups.find(word); group != groups.end())
            picture = changed(picture, group->second);
        else if (equals == std::string::npos)
            picture.erase(word.substr(1));
        else
            picture[word.substr(0, equals)] = word.substr(equals + 1);
    }
    return picture;
}

// Rows parted by semicolons: a code and its changes.
std::map<std::uint32_t, std::string> effectsOf(const std::string& table)
{
    std::map<std::uint32_t, std::string> effects;
    std::istringstream rows(table);
    for (std::string row; std::getline(rows, row, ';');) {
        std::size_t end = 0;
        const auto code = static_cast<std::uint32_t>(std::stoul(row, &end));
        effects[code] = row.substr(end);
    }
    return effects;
}

// Everything that a message can change is set.
Picture fill(TransferStatus& status)
{
    for (auto* const flag : {&status.ended, &status.ended3, &status.mark10, &status.ended10, &status.ended4,
                             &status.ended6, &status.ended8, &status.ended5, &status.ended9, &status.restoreStarted,
                             &status.switch24, &status.switch32, &status.switch34, &status.switch39})
        *flag = true;
    for (auto* const rate :
         {&status.rate0, &status.rate1, &status.rate2, &status.restoreRateShort, &status.restoreRateLong})
        *rate = 1;
    const std::pair<std::uint32_t, std::uint64_t> events[] = {{11, 0},   {13, 0},   {54, 0},
                                                              {18, 100}, {19, 200}, {53, 300}};
    for (const auto& [type, value] : events)
        event(status, type, value, 0, L"old");
    now += 1000;
    event(status, 16, 10);
    event(status, 17, 20, 1);
    event(status, 56, 30);
    return pictureOf(status);
}

TEST(TransferStatus, EveryEventHasItsEffect)
{
    // 16: no more than the total, but the sample counts. 17: without the flag no sample.
    const auto effects = effectsOf(
        "0 -backup ended=1; 1 -backup; 2 -backup ended=1; 3 -backup ended=1 ended3=1; 4 -backup ended=1 ended4=1;"
        "5 -backup ended=1 ended5=1; 6 -backup ended=1 ended6=1; 7; 8 -backup ended=1 ended8=1;"
        "9 -backup ended=1 ended9=1; 10 -backup ended=1 ended10=1 mark=1 totalA=500 totalB=500; 11 A=new; 12 -A;"
        "13 B=new; 14 -B; 15; 16 doneA=100 ringA=255; 17 doneB=200; 18 totalA=600; 19 totalB=700; 24; 25 -24; 32;"
        "33 -32; 34; 35 -34; 36 -mark; 39; 40 -39; 51 -restore started=1; 52 -restore; 53 total=500; 54 text=new;"
        "55 -text; 56 done=300 ring=265; 57 total=800; 20; 30; 99");
    for (const auto& [type, effect] : effects) {
        TransferStatus status(true, tick);
        const Picture full = fill(status);
        ASSERT_EQ(full.size(), 29u);
        now += 1000;
        event(status, type, 500, 0, L"new");
        EXPECT_EQ(pictureOf(status), changed(full, effect)) << "type " << type;
    }
}

TEST(TransferStatus, EverySnapshotHasItsEffect)
{
    const auto effects = effectsOf(
        "0 ended=1; 1 -backup; 2 ended=1 ended3=1; 3 ended=1 ended3=1; 4 ended=1 ended4=1; 5 ended=1 ended5=1;"
        "6 ended=1 ended6=1; 7; 8 ended=1 ended8=1; 9 ended=1 ended9=1; 10 ended=1 ended10=1 mark=1; 51 started=1;"
        "52 -restore; 53; 99");
    for (const auto& [state, effect] : effects) {
        TransferStatus status(true, tick);
        fill(status);
        event(status, 1);
        event(status, 19, 200);
        status.restoreStarted = false;
        const Picture before = pictureOf(status);
        status.apply(SnapshotMessage(state, 1, 2, 3, 4));
        EXPECT_EQ(pictureOf(status), changed(before, "-moving totalA=1 doneA=2 doneB=4 " + effect)) << state;
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
    std::thread listener([&] {
        for (std::uint32_t round = 0; round < 100000; ++round)
            event(status, round % 500 == 0 ? 51 + round / 500 % 7 : 54 + (round % 64 == 63), 1000, 1,
                  wxString(static_cast<wchar_t>(L'a' + round % 26), round % 40 + 1));
        status.apply(SnapshotMessage(51, 1, 2, 3, 4));
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
    int torn = 0;
    while (!done) {
        const wxString text = status.restoreText.get();
        torn += text.empty() || text == wxString(text[0], text.length()) ? 0 : 1;
    }
    listener.join();
    window.join();
    EXPECT_EQ(torn, 0);
}

} // namespace
} // namespace tavi
