#include "link/PipeMessage.h"

#include <cstring>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

using namespace tavi;
using namespace test;
using E = EventType;

static std::unique_ptr<PipeMessage> created(E type, const std::string& payload)
{
    const auto buffer = MessageBuffer::create();
    std::memcpy(buffer->data(), payload.data(), payload.size());
    buffer->setLength(static_cast<std::uint32_t>(payload.size()));
    return createMessage(static_cast<std::uint32_t>(type), *buffer);
}

TEST(PipeMessage, MessagesKeepTheirLayoutInBothDirections)
{
    const std::pair<std::shared_ptr<PipeMessage>, const char*> cases[] = {
        {std::make_shared<EventMessage>(E::restoreEnded),
         "34000000 14000000 00000000 0000000000000000 00000000 00000000"},
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
    for (const auto& [count, length] : counts) {
        const auto message = created(E::restoreItem, std::string(16, '\0') + bytes(count) + "abc");
        const wxString& held = *static_cast<const EventMessage&>(*message).text;
        EXPECT_EQ(held.length(), length) << count;
        EXPECT_TRUE(held.StartsWith(L"abc")) << count;
    }
}

TEST(PipeMessage, ABufferThatCannotGrowHoldsNoMessage)
{
    const auto buffer = MessageBuffer::create();
    buffer->ensure(UINT32_MAX);
    EXPECT_EQ(buffer->data(), nullptr);
    EXPECT_FALSE(createMessage(52, *buffer));
}
