#include "link/CommandPipe.h"

#include <thread>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"

using namespace tavi;
using namespace tavi::test;

TEST(CommandPipe, KeepsTheCommandOnlyIfThePipeCannotBeOpened)
{
    LogCapture log;
    auto command = cancelRestoreCommand();
    EXPECT_FALSE(sendCommand(command));
    EXPECT_EQ(log.takeText(), "1: Error: Unable to open command pipe: 2");
    ASSERT_TRUE(command);
    EXPECT_EQ(serialized(*command), serialized(*event(EventType::restoreEnded)));
    // A write that fails: the server hangs up and has read nothing.
    const PipeServer deaf(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
    std::thread writer([&] { EXPECT_FALSE(sendCommand(command)); });
    EXPECT_TRUE(deaf.waitClient());
    deaf.hangUp();
    writer.join();
    EXPECT_FALSE(command);
    EXPECT_EQ(log.takeText(), "");
}
