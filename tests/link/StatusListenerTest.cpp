#include "link/StatusListener.h"

#include <thread>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"

using namespace tavi;

namespace {

using namespace test;

struct Listener {
    ~Listener()
    {
        stop = true;
        thread.join();
        setMessageSink(nullptr);
    }
    std::atomic<bool> stop{false};
    std::atomic<int> checks{0};
    std::thread thread{[this] { listenToStatus([this] { return ++checks, stop.load(); }); }};
};

TEST(StatusListener, ReconnectsAfterAMalformedFrameAndKeepsTheStatus)
{
    const PipeServer servers[] = {{kStatus, PIPE_ACCESS_OUTBOUND, 2}, {kStatus, PIPE_ACCESS_OUTBOUND, 2}};
    const Listener listener;
    ASSERT_TRUE(servers[0].waitClient());
    servers[0].write(serialized(*event(EventType::restoreTotal, 7)) + serialized(CounterMessage(1, 1, 1, 1)));
    EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 7; }));
    const DWORD start = GetTickCount();
    servers[0].write(bytes("34000000 00000000"));
    ASSERT_TRUE(servers[1].waitClient());
    EXPECT_LT(GetTickCount() - start, 4000u) << "only a failed open waits";
    servers[1].write(serialized(*event(EventType::restoreMore, 2)));
    EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 9; }));
    servers[1].write(bytes("34000000 14000000")); // stops in mid-frame, which must not delay the listener's end
}

TEST(StatusListener, WaitsForAMissingServiceAndAfterAnException)
{
    LogCapture log;
    setMessageSink([](const PipeMessage&) { throw std::bad_alloc(); });
    DWORD start = GetTickCount();
    {
        const Listener listener;
        EXPECT_TRUE(waitUntil([&] { return listener.checks > 0; })) << "an attempt has failed";
        const PipeServer servers[] = {{kStatus, PIPE_ACCESS_OUTBOUND, 2}, {kStatus, PIPE_ACCESS_OUTBOUND, 2}};
        EXPECT_TRUE(servers[0].waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
        start = GetTickCount();
        servers[0].write(serialized(*event(EventType::restoreEnded)));
        EXPECT_TRUE(servers[1].waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
        servers[1].write(serialized(*event(EventType::restoreTotal, 9)));
        EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 9; }));
        start = GetTickCount();
    }
    EXPECT_LT(GetTickCount() - start, 4000u) << "a stop ends the pause between two attempts";
    EXPECT_EQ(log.take().size(), 2u);
}

} // namespace
