#include <cstring>
#include <deque>

#include <gtest/gtest.h>

#include "link/MessageReader.h"
#include "tests/link/Frames.h"

using namespace tavi;
using namespace tavi::test;
using E = EventType;

namespace {

std::unique_ptr<PipeMessage> created(E type, const std::string& payload)
{
    const auto buffer = MessageBuffer::create();
    std::memcpy(buffer->data(), payload.data(), payload.size());
    buffer->setLength(static_cast<std::uint32_t>(payload.size()));
    return createMessage(static_cast<std::uint32_t>(type), *buffer);
}

TEST(PipeMessage, MessagesKeepTheirLayoutInBothDirections)
{
    const std::pair<std::shared_ptr<PipeMessage>, const char*> cases[] = {
        {std::make_shared<EventMessage>(E::restoreItem, 0x01020304, 0x1122334455667788, 5, text(L"\u00e9")),
         "36000000 16000000 04030201 8877665544332211 05000000 02000000 c3a9"},
        {std::make_shared<SnapshotMessage>(51, 1, 2, 3, UINT64_MAX),
         "14000000 24000000 33000000 0100000000000000 0200000000000000 0300000000000000 ffffffffffffffff"},
        {std::make_shared<ItemMessage>(7, true, text(L"ab")),
         "15000000 12000000 0700000000000000 01000000 02000000 6162"},
        {std::make_shared<TextTripleMessage>(text(L"a"), text(L""), text(L"bc")),
         "16000000 0f000000 01000000 00000000 02000000 616263"},
        {std::make_shared<CounterMessage>(1, 2, 3, 4),
         "17000000 18000000 01000000 0200000000000000 0300000000000000 04000000"},
    };
    for (const auto& [message, frame] : cases) {
        const std::string expected = bytes(frame);
        EXPECT_EQ(serialized(*message), expected) << frame;
        EXPECT_EQ(serialized(*created(message->type(), expected.substr(kFrameHeaderSize))->clone()), expected) << frame;
    }
}

TEST(PipeMessage, TypeAndLengthDecideWhatIsCreated)
{
    constexpr std::size_t kLengths[] = {20, 36, 16, 12, 24}; // by kind
    for (std::uint32_t type = 0; type <= 60; ++type) {
        const bool isUnused =
            (type > 25 && type < 32) || (type > 40 && type < 51) || type == 37 || type == 38 || type > 57;
        const std::uint32_t kind = type >= 20 && type <= 23 ? type - 19 : 0;
        EXPECT_FALSE(created(E{type}, std::string(kLengths[kind] - 1, '\0'))) << type;
        const auto message = created(E{type}, std::string(kLengths[kind], '\0'));
        EXPECT_EQ(message == nullptr, isUnused) << type;
        EXPECT_TRUE(!message || message->kind() == MessageKind{kind}) << type;
    }
}

TEST(PipeMessage, TextsExtendToTheEndOfTheBufferAtMost)
{
    const std::pair<const char*, std::size_t> counts[] = {{"05000000", 5}, {"ffffffff", 1004}, {"00000080", 1004}};
    created(E::restoreItem, std::string(1000, 'x')); // the next buffers reuse its memory
    for (const auto& [count, length] : counts) {
        const auto message = created(E::restoreItem, std::string(16, '\0') + bytes(count) + "abc");
        EXPECT_EQ(*static_cast<const EventMessage&>(*message).text, L"abc" + wxString(L'\0', length - 3)) << count;
    }
}

// A peer that sends the parts and closes the pipe. After each part, and at an empty one, one look finds nothing.
struct Peer : ByteSource {
    explicit Peer(std::deque<std::string> sent) : parts(std::move(sent)) {}
    bool peek(std::uint32_t& available) override
    {
        available = parts.empty() ? 0 : static_cast<std::uint32_t>(parts[0].size());
        return !parts.empty();
    }
    void pause() override
    {
        ++pauses;
        if (!parts.empty() && parts[0].empty())
            parts.pop_front();
    }
    bool read(unsigned char* into, std::uint32_t size) override
    {
        largestRead = std::max(largestRead, size);
        parts[0].erase(0, parts[0].copy(reinterpret_cast<char*>(into), size));
        return true;
    }
    std::deque<std::string> parts;
    int pauses = 0;
    std::uint32_t largestRead = 0;
};

const std::string kHead = bytes("34000000 14000000"), kBody(20, '\0');

TEST(MessageReader, ReadsOneFrameOrNone)
{
    // The check that stops it (0: it gets none), whether there is a message, the pauses and the largest read.
    const std::tuple<const char*, std::deque<std::string>, int, bool, int, std::uint32_t> cases[] = {
        {"a frame in two parts", {kHead, kBody}, 0, true, 2, 20},
        {"a payload cut short, the rest reading as zeros", {kHead + "abc", "x"}, 0, true, 1, 20},
        {"nothing", {}, 0, false, 0, 0},
        {"a header cut short", {kHead.substr(0, 5)}, 0, false, 2, 8},
        {"no payload", {kHead}, 0, false, 2, 8},
        {"an announced length of 0", {bytes("34000000 00000000"), kBody}, 0, false, 1, 8},
        {"a length of 0xffffffff", {bytes("34000000 ffffffff") + kBody}, 0, true, 1, 1024},
        {"a length that is there", {bytes("34000000 00002000") + std::string(0x200000, '\0')}, 0, true, 1, 0x200000},
        {"a stop before the header", {"", kHead, kBody}, 1, false, 1, 0},
        {"a stop after the header", {"", kHead, kBody}, 3, false, 2, 8},
        {"a stop before the payload", {"", kHead, kBody}, 4, false, 3, 8}};
    for (const auto& [what, parts, stopAt, isRead, pauses, largestRead] : cases) {
        Peer peer(parts);
        const auto stops = [left = stopAt]() mutable { return --left == 0; };
        EXPECT_EQ(readFrame(peer, stopAt == 0 ? StopCheck() : stops) != nullptr, isRead) << what;
        EXPECT_EQ(peer.pauses, pauses) << what;
        EXPECT_EQ(peer.largestRead, largestRead) << what;
    }
}

} // namespace
