#include "link/PendingMessages.h"

#include <map>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using test::event;

constexpr std::size_t kMax = PendingMessages::kMaxCount;

TEST(PendingMessages, LoseTheOldestTextsAndAmountsOnly)
{
    PendingMessages pending;
    std::vector<std::uint64_t> left, taken;
    for (std::uint64_t i = 0; i < 3 * kMax; ++i) {
        const bool kept = i % 300 == 0;
        pending.put(event(kept ? 51 + i % 2 : 53 + i % 4, i));
        if (kept || i > 2 * kMax + 6)
            left.push_back(i);
    }
    while (const auto next = pending.take())
        taken.push_back(static_cast<const EventMessage&>(*next).value);
    EXPECT_EQ(taken.size(), kMax);
    EXPECT_EQ(taken, left);
    // Beyond the bound these are counted, and then leave no place for others.
    std::map<std::uint32_t, std::size_t> types;
    for (std::size_t i = 0; i < kMax; ++i) {
        pending.put(event(51 + i % 2));
        pending.put(std::make_unique<SnapshotMessage>(0, 0, 0, 0, 0));
        pending.put(event(54));
    }
    while (const auto next = pending.take())
        ++types[next->type()];
    EXPECT_EQ(types, (decltype(types){{20, kMax}, {51, kMax / 2}, {52, kMax / 2}}));
}

TEST(PendingMessages, HoldTextsUpToTheirBound)
{
    constexpr std::size_t bound = PendingMessages::kMaxTextBytes / sizeof(wchar_t);
    const std::tuple<std::uint32_t, std::size_t, int> cases[] = {
        {54, bound / 10, 10}, {56, bound / 3, 3}, {54, bound + 1, 0}, {51, bound + 1, 20}};
    for (const auto& [type, length, held] : cases) {
        PendingMessages pending;
        for (int i = 0; i < 20; ++i)
            pending.put(event(type, 0, wxString(L'x', length)));
        int taken = 0;
        for (; const auto next = pending.take(); ++taken)
            EXPECT_EQ(static_cast<const EventMessage&>(*next).text->empty(), type == 51);
        EXPECT_EQ(taken, held) << type;
    }
}

TEST(PendingMessages, HaveOneNotificationInFlight)
{
    PendingMessages pending;
    EXPECT_FALSE(pending.accept(nullptr));
    const PipeMessage* const first = pending.put(event(56));
    ASSERT_TRUE(first);
    EXPECT_FALSE(pending.accept(first + 1));
    while (pending.take()) {
    }
    EXPECT_FALSE(pending.put(event(56))) << "in flight, though its message was taken";
    EXPECT_TRUE(pending.accept(first));
    EXPECT_FALSE(pending.accept(first));
    EXPECT_TRUE(pending.put(event(56)));
    pending.clear();
    EXPECT_FALSE(pending.take());
    EXPECT_TRUE(pending.put(event(56))) << "the one before never arrived";
}

} // namespace
} // namespace tavi
