#include "link/PendingMessages.h"

#include <map>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using E = EventType;
using test::event;

constexpr std::size_t kMax = PendingMessages::kMaxCount;

TEST(PendingMessages, LoseTheOldestTextsAndAmountsOnly)
{
    PendingMessages pending;
    std::vector<std::uint64_t> left, taken;
    for (std::uint64_t i = 0; i < 3 * kMax; ++i) {
        pending.put(event(i % 300 == 0 ? E::restoreStarted : i % 2 == 0 ? E::restoreItem : E::restoreDone, i));
        if (i % 300 == 0 || i > 2 * kMax + 6)
            left.push_back(i);
    }
    while (const auto next = pending.take())
        taken.push_back(static_cast<const EventMessage&>(*next).value);
    EXPECT_EQ(taken, left);
}

TEST(PendingMessages, CountStartsEndsAndSnapshotsBeyondTheBound)
{
    PendingMessages pending;
    std::map<EventType, std::size_t> taken;
    for (std::size_t i = 0; i < kMax; ++i) {
        pending.put(event(i % 2 == 0 ? E::restoreStarted : E::restoreEnded));
        pending.put(std::make_unique<SnapshotMessage>(0, 0, 0, 0, 0));
        pending.put(event(E::restoreItem));
    }
    while (const auto next = pending.take())
        ++taken[next->type()];
    EXPECT_EQ(taken,
              (decltype(taken){{E::snapshot, kMax}, {E::restoreStarted, kMax / 2}, {E::restoreEnded, kMax / 2}}));
}

TEST(PendingMessages, HoldTextsUpToTheirBound)
{
    constexpr std::size_t bound = PendingMessages::kMaxTextBytes / sizeof(wchar_t);
    // How many of twenty messages with a text of this length stay. A start stays without its text.
    const std::tuple<EventType, std::size_t, int> cases[] = {
        {E::restoreDone, bound / 3, 3}, {E::restoreItem, bound + 1, 0}, {E::restoreStarted, bound + 1, 20}};
    for (const auto& [type, length, held] : cases) {
        PendingMessages pending;
        for (int i = 0; i < 20; ++i)
            pending.put(event(type, 0, wxString(L'x', length)));
        int taken = 0;
        for (; const auto next = pending.take(); ++taken)
            EXPECT_EQ(static_cast<const EventMessage&>(*next).text->empty(), type == E::restoreStarted);
        EXPECT_EQ(taken, held) << length;
    }
}

TEST(PendingMessages, HaveOneNotificationInFlight)
{
    PendingMessages pending;
    EXPECT_FALSE(pending.accept(nullptr));
    const PipeMessage* const first = pending.put(event(E::restoreDone));
    ASSERT_TRUE(first);
    EXPECT_FALSE(pending.accept(first + 1));
    EXPECT_TRUE(pending.take());
    EXPECT_FALSE(pending.put(event(E::restoreDone))) << "in flight, though its message was taken";
    EXPECT_TRUE(pending.accept(first));
    EXPECT_FALSE(pending.accept(first));
    EXPECT_TRUE(pending.put(event(E::restoreDone)));
    pending.clear();
    EXPECT_FALSE(pending.take());
    EXPECT_TRUE(pending.put(event(E::restoreDone))) << "the one before never arrived";
}

} // namespace
} // namespace tavi
