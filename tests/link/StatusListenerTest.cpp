#include "link/StatusListener.h"

#include <thread>
#include <utility>

#include <gtest/gtest.h>

#include "link/CommandPipe.h"
#include "link/PipeIo.h"
#include "tests/link/Frames.h"
#include "tests/support/Pipes.h"

namespace tavi {
namespace {

using namespace test;

constexpr const wchar_t* kStatus = L"\\\\.\\pipe\\tavistatus";
constexpr const wchar_t* kCommand = L"\\\\.\\pipe\\tavibackup";

std::string frame(std::uint32_t type, std::uint64_t value)
{
    return serialised(EventMessage(type, 0, value, 0, text(L"")));
}

class Listener {
  public:
    ~Listener()
    {
        stop = true;
        thread_.join();
    }
    std::atomic<bool> stop{false};

  private:
    std::thread thread_{[this] { listenToStatus([this] { return stop.load(); }); }};
};

std::atomic<int> passedOn{0};

TEST(StatusListener, FollowsTheServiceThroughWhateverItSends)
{
    setMessageSink([](std::unique_ptr<PipeMessage>) { ++passedOn; });
    passedOn = 0;
    TransferStatus& status = transferStatus();
    // Two instances: a client that comes again at once finds the other one free.
    const PipeServer servers[] = {{kStatus, PIPE_ACCESS_OUTBOUND, 2}, {kStatus, PIPE_ACCESS_OUTBOUND, 2}};
    const PipeServer* server = &servers[0];
    const auto reaches = [&](std::int64_t total) { return waitUntil([&] { return status.restoreTotal == total; }); };
    {
        const Listener listener;
        ASSERT_TRUE(server->waitClient());
        server->write(frame(53, 7) + frame(57, 1) + std::string("\x17\0\0\0\x18\0\0\0", 8) + std::string(24, '\1'));
        EXPECT_TRUE(reaches(8));
        // Each of these makes it hang up and come again at once; what it knows stays.
        const std::string body(20, '\0');
        for (const std::string& bad :
             {bytes("1e000000 14000000") + body, bytes("34000000 13000000") + body, bytes("34000000 00000000"),
              bytes("340000"), bytes("ffffffff ffffffff ffffffff")}) {
            server->write(bad);
            const PipeServer* const left = std::exchange(server, server == servers ? &servers[1] : servers);
            const DWORD start = GetTickCount();
            ASSERT_TRUE(server->waitClient());
            EXPECT_LT(GetTickCount() - start, 4000u) << "only a failed open waits";
            left->hangUp();
            EXPECT_EQ(status.restoreTotal, 8);
        }
        // Text and length of four gigabytes: the message counts, and the next one too.
        server->write(bytes("36000000 ffffffff") + std::string(16, '\0') + bytes("ffffffff 6162"));
        EXPECT_TRUE(waitUntil([&] { return status.restoreText.get().StartsWith("ab"); }));
        server->write(frame(55, 0) + frame(57, 2));
        EXPECT_TRUE(reaches(10));
        // A peer that stops in mid-frame holds the listener, but not its end.
        server->write(bytes("34000000 14000000"));
        Sleep(50);
    }
    EXPECT_EQ(passedOn, 6);
    setMessageSink(nullptr);
    dispatch(std::make_unique<EventMessage>(52));
    EXPECT_EQ(status.restoreTotal, 0);
}

TEST(StatusListener, WaitsForAServiceThatIsNotThereAndAfterAnException)
{
    LogCapture log;
    setMessageSink([](std::unique_ptr<PipeMessage>) { throw std::bad_alloc(); });
    DWORD start = GetTickCount();
    {
        Listener listener;
        Sleep(200);
        const PipeServer servers[] = {{kStatus, PIPE_ACCESS_OUTBOUND, 2}, {kStatus, PIPE_ACCESS_OUTBOUND, 2}};
        EXPECT_TRUE(servers[0].waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
        start = GetTickCount();
        servers[0].write(frame(52, 0));
        EXPECT_TRUE(servers[1].waitClient());
        EXPECT_GT(GetTickCount() - start, 4500u);
    }
    setMessageSink(nullptr);
    EXPECT_EQ(log.take().size(), 1u);
    // The end is not kept waiting by the pause between two attempts.
    const DWORD stop = GetTickCount();
    {
        const Listener listener;
        Sleep(100);
    }
    EXPECT_LT(GetTickCount() - stop, 1500u);
}

TEST(CommandPipe, SendsOneFrameAndHangsUp)
{
    LogCapture log;
    auto command = CommandPipe::CancelRestore();
    EXPECT_FALSE(CommandPipe::sendCommand(command));
    EXPECT_TRUE(command) << "left as it is when the pipe cannot be opened";
    EXPECT_EQ(log.take(), std::vector<std::string>{"1: Error: Unable to open command pipe: 2"});
    {
        const PipeServer server(kCommand, PIPE_ACCESS_INBOUND);
        EXPECT_TRUE(CommandPipe::sendCommand(command));
        EXPECT_FALSE(command);
        command = CommandPipe::CancelRestore();
        EXPECT_FALSE(CommandPipe::sendCommand(command));
        EXPECT_EQ(log.take(), std::vector<std::string>{"1: Error: Unable to open command pipe: 231"});
        EXPECT_EQ(hex(server.readAll()), "3400000014000000" + std::string(40, '0'));
    }
    // A write that fails: nobody reads, and then nobody is there.
    const PipeServer deaf(kCommand, PIPE_ACCESS_INBOUND, 1, 0);
    std::thread writer([&] { EXPECT_FALSE(CommandPipe::sendCommand(command)); });
    EXPECT_TRUE(deaf.waitClient());
    deaf.hangUp();
    writer.join();
    EXPECT_FALSE(command);
    EXPECT_TRUE(log.take().empty());
}

TEST(PipeIo, ReadsWithAndWithoutOverlap)
{
    std::unique_ptr<PipeMessage> message;
    EXPECT_FALSE(readMessage(INVALID_HANDLE_VALUE, &message, nullptr));
    EXPECT_FALSE(readMessage(nullptr, nullptr, nullptr));
    EXPECT_FALSE(writeMessage(GetStdHandle(STD_OUTPUT_HANDLE), message));
    for (const bool overlaps : {false, true}) {
        const PipeServer server(kStatus, PIPE_ACCESS_OUTBOUND);
        const FileHandle pipe(CreateFileW(kStatus, GENERIC_READ, 0, nullptr, OPEN_EXISTING,
                                          overlaps ? FILE_FLAG_OVERLAPPED : FILE_ATTRIBUTE_NORMAL, nullptr));
        const KernelHandle event(CreateEventW(nullptr, TRUE, FALSE, nullptr));
        OVERLAPPED overlapped{};
        overlapped.hEvent = event.get();
        OVERLAPPED* const form = overlaps ? &overlapped : nullptr;
        server.write(frame(57, 1) + frame(52, 0));
        for (const std::uint32_t type : {57u, 52u}) {
            ASSERT_TRUE(readMessage(pipe.get(), &message, nullptr, form));
            EXPECT_EQ(message->type(), type);
        }
        int asked = 0;
        EXPECT_FALSE(readMessage(
            pipe.get(), &message, [&] { return ++asked == 3; }, form));
        EXPECT_FALSE(message);
        server.hangUp();
        EXPECT_FALSE(readMessage(pipe.get(), &message, nullptr, form));
        message = std::make_unique<EventMessage>(1);
        EXPECT_FALSE(writeMessage(pipe.get(), message));
        EXPECT_TRUE(message) << "left to the caller";
    }
}

} // namespace
} // namespace tavi
