#include "link/StatusListener.h"

#include <thread>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"

namespace tavi {
namespace {

using namespace test;

struct Listener {
    ~Listener()
    {
        stop = true;
        thread.join();
    }
    std::atomic<bool> stop{false};
    std::thread thread{[this] { listenToStatus([this] { return stop.load(); }); }};
};

std::atomic<int> passedOn{0};

TEST(StatusListener, ReconnectsAfterAMalformedFrameAndKeepsTheStatus)
{
    setMessageSink([](std::unique_ptr<PipeMessage>) { ++passedOn; });
    passedOn = 0;
    TransferStatus& status = transferStatus();
    // Two instances: a client that reconnects at once finds a free one.
    const PipeServer first(kStatus, PIPE_ACCESS_OUTBOUND, 2);
    const PipeServer second(kStatus, PIPE_ACCESS_OUTBOUND, 2);
    {
        const Listener listener;
        ASSERT_TRUE(first.waitClient());
        first.write(serialised(*event(EventType::restoreTotal, 7)) + serialised(*event(EventType::restoreMore, 1)) +
                    serialised(CounterMessage(1, 1, 1, 1)));
        EXPECT_TRUE(waitUntil([&] { return status.restoreTotal == 8; }));
        first.write(bytes("34000000 00000000"));
        const DWORD start = GetTickCount();
        ASSERT_TRUE(second.waitClient());
        EXPECT_LT(GetTickCount() - start, 4000u) << "only a failed open waits";
        EXPECT_EQ(status.restoreTotal, 8);
        second.write(serialised(*event(EventType::restoreItemEnded)) + serialised(*event(EventType::restoreMore, 2)));
        EXPECT_TRUE(waitUntil([&] { return status.restoreTotal == 10; }));
        // A peer that stops in mid-frame does not delay the listener's end.
        second.write(bytes("34000000 14000000"));
        Sleep(50);
    }
    EXPECT_EQ(passedOn, 5);
    setMessageSink(nullptr);
    dispatch(event(EventType::restoreEnded));
    EXPECT_EQ(status.restoreTotal, 0);
}

TEST(StatusListener, WaitsForAMissingServiceAndAfterAnException)
{
    LogCapture log;
    setMessageSink([](std::unique_ptr<PipeMessage>) { throw std::bad_alloc(); });
    DWORD start = GetTickCount();
    {
        Listener listener;
        Sleep(200);
        const PipeServer first(kStatus, PIPE_ACCESS_OUTBOUND, 2);
        const PipeServer second(kStatus, PIPE_ACCESS_OUTBOUND, 2);
        EXPECT_TRUE(first.waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
        start = GetTickCount();
        first.write(serialised(*event(EventType::restoreEnded)));
        EXPECT_TRUE(second.waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
        second.write(serialised(*event(EventType::restoreTotal, 9)));
        EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 9; }));
        start = GetTickCount();
    }
    EXPECT_LT(GetTickCount() - start, 1500u) << "a stop ends the pause between two attempts";
    setMessageSink(nullptr);
    EXPECT_EQ(log.take().size(), 2u);
}

} // namespace
} // namespace tavi
