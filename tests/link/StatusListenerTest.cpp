#include "link/StatusListener.h"

#include <thread>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"

using namespace tavi;
using namespace tavi::test;

TEST(StatusListener, ReconnectsKeepingTheStatusAndWaitsForAMissingServiceAndAfterAnException)
{
    LogCapture log;
    std::atomic<bool> stop{false};
    std::atomic<int> checks{0};
    DWORD start = GetTickCount();
    std::thread listener([&] { listenToStatus([&] { return ++checks, stop.load(); }); });
    EXPECT_TRUE(waitUntil([&] { return checks > 0; })) << "an attempt has failed";
    const PipeServer servers[] = {
        {kStatus, PIPE_ACCESS_OUTBOUND, 3}, {kStatus, PIPE_ACCESS_OUTBOUND, 3}, {kStatus, PIPE_ACCESS_OUTBOUND, 3}};
    EXPECT_TRUE(servers[0].waitClient());
    EXPECT_GT(GetTickCount() - start, 4500u);
    servers[0].write(serialized(*event(EventType::restoreTotal, 7)) + serialized(CounterMessage(1, 1, 1, 1)));
    EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 7; }));
    start = GetTickCount();
    servers[0].write(bytes("34000000 00000000")); // malformed
    EXPECT_TRUE(servers[1].waitClient());
    EXPECT_LT(GetTickCount() - start, 4000u);
    setMessageSink([](const PipeMessage&) { throw std::bad_alloc(); });
    start = GetTickCount();
    servers[1].write(serialized(*event(EventType::restoreMore, 2)));
    EXPECT_TRUE(servers[2].waitClient());
    EXPECT_GT(GetTickCount() - start, 4500u);
    servers[2].write(serialized(*event(EventType::restoreMore, 4)));
    EXPECT_TRUE(waitUntil([] { return transferStatus().restoreTotal == 13; }));
    start = GetTickCount();
    stop = true;
    listener.join();
    EXPECT_LT(GetTickCount() - start, 4000u) << "a stop ends the pause between two attempts";
    setMessageSink(nullptr);
    EXPECT_EQ(log.take().size(), 2u);
}
