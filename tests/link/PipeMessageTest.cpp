#include "link/PipeMessage.h"

#include <cstring>
#include <map>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using namespace test;

// A payload as a reader leaves it in the buffer.
std::unique_ptr<PipeMessage> created(EventType type, const std::string& payload, std::uint32_t length)
{
    const auto buffer = MessageBuffer::create();
    buffer->ensure(static_cast<std::uint32_t>(payload.size()));
    std::memcpy(buffer->data(), payload.data(), payload.size());
    buffer->setLength(length);
    return createMessage(static_cast<std::uint32_t>(type), *buffer);
}

TEST(PipeMessage, EveryKindKeepsItsLayoutInBothDirections)
{
    const std::pair<std::shared_ptr<PipeMessage>, const char*> cases[] = {
        {std::make_shared<EventMessage>(EventType::restoreEnded),
         "34000000 14000000 00000000 0000000000000000 00000000 00000000"},
        {std::make_shared<EventMessage>(EventType::restoreItem, 0x01020304, 0x1122334455667788, 5, text(L"\u00e9")),
         "36000000 16000000 04030201 8877665544332211 05000000 02000000 c3a9"},
        {std::make_shared<SnapshotMessage>(51, 1, 2, 3, UINT64_MAX),
         "14000000 24000000 33000000 0100000000000000 0200000000000000 0300000000000000 ffffffffffffffff"},
        {std::make_shared<ItemMessage>(7, true, text(L"ab")),
         "15000000 12000000 0700000000000000 01000000 02000000 6162"},
        {std::make_shared<TextTripleMessage>(text(L"a"), text(L""), text(L"bc")),
         "16000000 0f000000 01000000 00000000 02000000 616263"},
        {std::make_shared<CounterMessage>(9, 1, 0x100000000, 0xfffffffe),
         "17000000 18000000 09000000 0100000000000000 0000000001000000 feffffff"},
    };
    for (const auto& [message, frame] : cases) {
        const std::string expected = bytes(frame);
        EXPECT_EQ(serialised(*message), expected) << frame;
        const std::string payload = expected.substr(kFrameHeaderSize);
        const auto length = static_cast<std::uint32_t>(payload.size());
        const auto read = created(message->type(), payload, length);
        ASSERT_TRUE(read) << frame;
        EXPECT_EQ(read->kind(), message->kind());
        EXPECT_EQ(serialised(*read->clone()), expected) << frame;
    }
    // Any flag word but 0 is true, and goes out as 1.
    const auto item = created(EventType::item, bytes("0000000000000000 07000000 00000000"), 16);
    EXPECT_EQ(serialised(*item), bytes("15000000 10000000 0000000000000000 01000000 00000000"));
}

TEST(PipeMessage, TypesAndShortestPayloadsDecideWhatIsCreated)
{
    const std::string zeros(64, '\0');
    const std::map<std::uint32_t, std::pair<MessageKind, std::uint32_t>> special = {{20, {MessageKind::snapshot, 36}},
                                                                                    {21, {MessageKind::item, 16}},
                                                                                    {22, {MessageKind::textTriple, 12}},
                                                                                    {23, {MessageKind::counter, 24}}};
    for (std::uint32_t number = 0; number <= 60; ++number) {
        const bool unused = (number >= 26 && number <= 31) || number == 37 || number == 38 ||
                            (number >= 41 && number <= 50) || number > 57;
        const auto [kind, least] = special.count(number) ? special.at(number) : std::pair(MessageKind::event, 20u);
        const EventType type{number};
        EXPECT_FALSE(created(type, zeros, least - 1)) << number;
        const auto message = created(type, zeros, least);
        ASSERT_EQ(message == nullptr, unused) << number;
        EXPECT_TRUE(unused || (message->kind() == kind && message->type() == type)) << number;
    }
    EXPECT_FALSE(created(EventType{UINT32_MAX}, zeros, 64));
}

TEST(PipeMessage, TextCountsAreBelievedUpToTheEndOfTheBuffer)
{
    // What lies behind the payload is read along, and nothing behind the buffer.
    const std::string head = bytes("00000000 0000000000000000 00000000");
    const std::pair<const char*, std::size_t> counts[] = {
        {"03000000", 3}, {"05000000", 5}, {"ffffffff", 1024 - 20}, {"00000080", 1024 - 20}};
    for (const auto& [count, length] : counts) {
        const auto message = created(EventType::restoreItem, head + bytes(count) + "abc", 23);
        const wxString& held = *static_cast<const EventMessage&>(*message).text;
        EXPECT_EQ(held.length(), length);
        EXPECT_TRUE(held.StartsWith(L"abc"));
    }
    const auto triple = created(EventType::textTriple, bytes("01000000 ffffffff ffffffff") + "xyz", 15);
    const auto& texts = static_cast<const TextTripleMessage&>(*triple);
    EXPECT_EQ(*texts.text1, L"x");
    EXPECT_EQ(texts.text2->length(), 1024u - 13);
    EXPECT_TRUE(texts.text3->empty());
    const auto damaged = created(EventType::restoreItem, head + bytes("04000000 61ff80c3"), 24);
    EXPECT_EQ(*static_cast<const EventMessage&>(*damaged).text, L"a\ufffd\ufffd\ufffd");
}

TEST(PipeMessage, BuffersGrowByAKilobyteMoreThanAsked)
{
    const auto buffer = MessageBuffer::create();
    const std::pair<std::uint32_t, std::uint32_t> steps[] = {
        {44, 1024}, {1024, 1024}, {1025, 2049}, {2000, 2049}, {UINT32_MAX, 0}};
    for (const auto& [size, capacity] : steps) {
        buffer->ensure(size);
        EXPECT_EQ(buffer->capacity(), capacity);
        EXPECT_EQ(buffer->data() == nullptr, capacity == 0);
    }
    EXPECT_FALSE(createMessage(52, *buffer));
    EXPECT_EQ(serialised(*event(EventType::textA, 0, wxString(L'x', 2000))).size(), 2028u);
}

} // namespace
} // namespace tavi
