#include "link/PendingMessages.h"

#include <map>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

using namespace tavi;
using E = EventType;
using test::event;

static constexpr std::size_t kMax = PendingMessages::kMaxCount;

TEST(PendingMessages, LoseTheOldestTextsAndAmountsOnly)
{
    PendingMessages pending;
    std::vector<std::uint64_t> left, taken;
    for (std::uint64_t i = 0; i < 3 * kMax; ++i) {
        pending.put(event(i % 300 == 0 ? E::restoreStarted : i % 2 == 0 ? E::restoreItem : E::restoreDone, i, "text"));
        if (i % 300 == 0 || i > 2 * kMax + 6)
            left.push_back(i % 300 == 0 ? 0 : i); // a start stays without its content
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
        pending.put(std::make_unique<SnapshotMessage>(0, 0, 0, 0, 0));
        for (const E type : {E::restoreStarted, E::restoreEnded, E::restoreItem})
            pending.put(event(type));
    }
    while (const auto next = pending.take())
        ++taken[next->type()];
    EXPECT_EQ(taken, (decltype(taken){{E::snapshot, kMax}, {E::restoreStarted, kMax}, {E::restoreEnded, kMax}}));
}

TEST(PendingMessages, HoldTextsUpToTheirBound)
{
    constexpr std::size_t kBound = PendingMessages::kMaxTextBytes / sizeof(wchar_t);
    for (const auto& [length, held] : {std::pair(kBound / 3, 3), std::pair(kBound + 1, 0)}) {
        PendingMessages pending;
        for (int i = 0; i < 20; ++i)
            pending.put(event(E::restoreItem, 0, wxString(L'x', length)));
        int taken = 0;
        while (pending.take())
            ++taken;
        EXPECT_EQ(taken, held) << length;
    }
}

TEST(PendingMessages, HaveOneNotificationInFlight)
{
    PendingMessages pending;
    const PipeMessage* const first = pending.put(event(E::restoreDone));
    EXPECT_TRUE(pending.take() && !pending.put(event(E::restoreDone))) << "in flight, though its message was taken";
    EXPECT_FALSE(pending.accept(nullptr) || pending.accept(first + 1));
    EXPECT_TRUE(pending.accept(first));
    EXPECT_FALSE(pending.accept(first));
    EXPECT_TRUE(pending.put(event(E::restoreDone)));
    pending.clear();
    EXPECT_TRUE(!pending.take() && pending.put(event(E::restoreDone))) << "the one before never arrived";
}
