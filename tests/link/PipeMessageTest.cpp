#include "link/PipeMessage.h"

#include <cstring>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using namespace test;
using E = EventType;

// Creates a message as the reader does; by default the announced length is the payload's.
std::unique_ptr<PipeMessage> created(E type, const std::string& payload, std::size_t length = 0)
{
    const auto buffer = MessageBuffer::create();
    buffer->ensure(static_cast<std::uint32_t>(payload.size()));
    std::memcpy(buffer->data(), payload.data(), payload.size());
    buffer->setLength(static_cast<std::uint32_t>(length > 0 ? length : payload.size()));
    return createMessage(static_cast<std::uint32_t>(type), *buffer);
}

TEST(PipeMessage, EveryKindKeepsItsLayoutInBothDirections)
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
        {std::make_shared<CounterMessage>(9, 1, 0x100000000, 0xfffffffe),
         "17000000 18000000 09000000 0100000000000000 0000000001000000 feffffff"},
    };
    for (const auto& [message, frame] : cases) {
        const std::string expected = bytes(frame);
        EXPECT_EQ(serialised(*message), expected) << frame;
        const auto read = created(message->type(), expected.substr(kFrameHeaderSize));
        ASSERT_TRUE(read) << frame;
        EXPECT_EQ(read->kind(), message->kind());
        EXPECT_EQ(serialised(*read->clone()), expected) << frame;
    }
    // Any flag but 0 is read as true and written as 1.
    const auto item = created(E::item, bytes("0000000000000000 07000000 00000000"));
    EXPECT_EQ(serialised(*item), bytes("15000000 10000000 0000000000000000 01000000 00000000"));
}

TEST(PipeMessage, TypeAndLengthDecideWhatIsCreated)
{
    const std::string zeros(64, '\0');
    const MessageKind special[] = {MessageKind::snapshot, MessageKind::item, MessageKind::textTriple,
                                   MessageKind::counter};
    const std::uint32_t lengths[] = {36, 16, 12, 24};
    for (std::uint32_t type = 0; type <= 60; ++type) {
        const bool isUnused =
            (type >= 26 && type <= 31) || type == 37 || type == 38 || (type >= 41 && type <= 50) || type > 57;
        const bool isSpecial = type >= 20 && type <= 23;
        const std::uint32_t least = isSpecial ? lengths[type - 20] : 20;
        EXPECT_FALSE(created(E{type}, zeros, least - 1)) << type;
        const auto message = created(E{type}, zeros, least);
        ASSERT_EQ(message == nullptr, isUnused) << type;
        EXPECT_TRUE(isUnused || message->kind() == (isSpecial ? special[type - 20] : MessageKind::event)) << type;
    }
    EXPECT_FALSE(created(E{UINT32_MAX}, zeros));
}

TEST(PipeMessage, TextsExtendToTheEndOfTheBufferAtMost)
{
    const std::string head = bytes("00000000 0000000000000000 00000000");
    const std::pair<const char*, std::size_t> counts[] = {{"05000000", 5}, {"ffffffff", 1004}, {"00000080", 1004}};
    for (const auto& [count, length] : counts) {
        const auto message = created(E::restoreItem, head + bytes(count) + "abc");
        const wxString& held = *static_cast<const EventMessage&>(*message).text;
        EXPECT_EQ(held.length(), length);
        EXPECT_TRUE(held.StartsWith(L"abc"));
    }
    const auto triple = created(E::textTriple, bytes("01000000 ffffffff ffffffff") + "xyz");
    const auto& texts = static_cast<const TextTripleMessage&>(*triple);
    EXPECT_EQ(*texts.text1, L"x");
    EXPECT_EQ(texts.text2->length(), 1024u - 13);
    EXPECT_TRUE(texts.text3->empty());
}

TEST(PipeMessage, BuffersGrowByAKilobyteMoreThanNeeded)
{
    const auto buffer = MessageBuffer::create();
    const std::pair<std::uint32_t, std::uint32_t> steps[] = {{1024, 1024}, {1025, 2049}, {2000, 2049}, {UINT32_MAX, 0}};
    for (const auto& [size, capacity] : steps) {
        buffer->ensure(size);
        EXPECT_EQ(buffer->capacity(), capacity);
        EXPECT_EQ(buffer->data() == nullptr, capacity == 0);
    }
    EXPECT_FALSE(createMessage(52, *buffer));
    EXPECT_EQ(serialised(*event(E::textA, 0, wxString(L'x', 2000))).size(), 2028u);
}

} // namespace
} // namespace tavi
