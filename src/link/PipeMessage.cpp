#include "link/PipeMessage.h"

#include <algorithm>
#include <cstring>
#include <initializer_list>
#include <string>
#include <string_view>

#include "core/Utf8.h"

namespace tavi {
namespace {

// Writes one frame into a buffer. Writes nothing if the buffer could not grow.
class FrameWriter {
  public:
    FrameWriter(MessageBuffer& buffer, EventType type, std::uint32_t fixedPayload,
                std::initializer_list<std::string_view> texts = {})
    {
        std::uint64_t size = std::uint64_t{kFrameHeaderSize} + fixedPayload;
        for (const std::string_view text : texts)
            size += text.size();
        const bool fits = size <= UINT32_MAX;
        if (fits)
            buffer.ensure(static_cast<std::uint32_t>(size));
        at_ = fits ? buffer.data() : nullptr;
        buffer.setLength(at_ ? static_cast<std::uint32_t>(size) : 0);
        u32(static_cast<std::uint32_t>(type));
        u32(static_cast<std::uint32_t>(size - kFrameHeaderSize));
    }
    void u32(std::uint32_t value) noexcept
    {
        for (int shift = 0; at_ && shift < 32; shift += 8)
            *at_++ = static_cast<unsigned char>(value >> shift);
    }
    void u64(std::uint64_t value) noexcept
    {
        u32(static_cast<std::uint32_t>(value));
        u32(static_cast<std::uint32_t>(value >> 32));
    }
    void count(std::string_view text) noexcept
    {
        u32(static_cast<std::uint32_t>(text.size()));
    }
    void bytes(std::string_view text) noexcept
    {
        if (at_ && !text.empty())
            at_ = std::copy(text.begin(), text.end(), at_);
    }

  private:
    unsigned char* at_;
};

// Reads a payload in order, within the buffer's capacity: the announced length is the peer's and may be false.
class PayloadReader {
  public:
    explicit PayloadReader(const MessageBuffer& buffer) noexcept : buffer_(buffer) {}
    std::uint32_t u32() noexcept
    {
        std::uint32_t value = 0;
        for (int shift = 0; shift < 32; shift += 8)
            value |= std::uint32_t{buffer_.data()[at_++]} << shift;
        return value;
    }
    std::uint64_t u64() noexcept
    {
        const std::uint64_t low = u32();
        return low | std::uint64_t{u32()} << 32;
    }
    MessageText text(std::uint32_t count)
    {
        const std::uint32_t held = std::min(count, buffer_.capacity() - at_);
        const auto* const start = reinterpret_cast<const char*>(buffer_.data() + at_);
        at_ += held;
        return std::make_shared<const wxString>(fromUtf8({start, held}));
    }

  private:
    const MessageBuffer& buffer_;
    std::uint32_t at_ = 0;
};

MessageKind kindOf(EventType type) noexcept
{
    switch (type) {
    case EventType::snapshot:
        return MessageKind::snapshot;
    case EventType::item:
        return MessageKind::item;
    case EventType::textTriple:
        return MessageKind::textTriple;
    case EventType::counter:
        return MessageKind::counter;
    default:
        return MessageKind::event;
    }
}

std::uint32_t minPayloadBytes(MessageKind kind) noexcept
{
    switch (kind) {
    case MessageKind::snapshot:
        return SnapshotMessage::kMinPayloadBytes;
    case MessageKind::item:
        return ItemMessage::kMinPayloadBytes;
    case MessageKind::textTriple:
        return TextTripleMessage::kMinPayloadBytes;
    case MessageKind::counter:
        return CounterMessage::kMinPayloadBytes;
    case MessageKind::event:
        break;
    }
    return EventMessage::kMinPayloadBytes;
}

std::string bytesOf(const MessageText& text)
{
    return toUtf8(view(*text));
}

} // namespace

EventMessage::EventMessage(EventType type) : EventMessage(type, 0, 0, 0, std::make_shared<const wxString>()) {}

EventMessage::EventMessage(EventType type, std::uint32_t newCode, std::uint64_t newValue, std::uint32_t newFlag,
                           MessageText newText)
    : PipeMessage(MessageKind::event, type), code(newCode), value(newValue), flag(newFlag), text(std::move(newText))
{
}

void EventMessage::serialize(MessageBuffer& buffer) const
{
    const std::string bytes = bytesOf(text);
    FrameWriter frame(buffer, type(), kMinPayloadBytes, {bytes});
    frame.u32(code);
    frame.u64(value);
    frame.u32(flag);
    frame.count(bytes);
    frame.bytes(bytes);
}

std::unique_ptr<PipeMessage> EventMessage::clone() const
{
    return std::make_unique<EventMessage>(type(), code, value, flag, text);
}

SnapshotMessage::SnapshotMessage(std::uint32_t newState, std::uint64_t newCounter0, std::uint64_t newCounter1,
                                 std::uint64_t newCounter2, std::uint64_t newCounter3)
    : PipeMessage(MessageKind::snapshot, EventType::snapshot), state(newState), counter0(newCounter0),
      counter1(newCounter1), counter2(newCounter2), counter3(newCounter3)
{
}

void SnapshotMessage::serialize(MessageBuffer& buffer) const
{
    FrameWriter frame(buffer, type(), kMinPayloadBytes);
    frame.u32(state);
    for (const std::uint64_t counter : {counter0, counter1, counter2, counter3})
        frame.u64(counter);
}

std::unique_ptr<PipeMessage> SnapshotMessage::clone() const
{
    return std::make_unique<SnapshotMessage>(state, counter0, counter1, counter2, counter3);
}

ItemMessage::ItemMessage(std::uint64_t newValue, bool newFlag, MessageText newText)
    : PipeMessage(MessageKind::item, EventType::item), value(newValue), flag(newFlag), text(std::move(newText))
{
}

void ItemMessage::serialize(MessageBuffer& buffer) const
{
    const std::string bytes = bytesOf(text);
    FrameWriter frame(buffer, type(), kMinPayloadBytes, {bytes});
    frame.u64(value);
    frame.u32(flag ? 1 : 0);
    frame.count(bytes);
    frame.bytes(bytes);
}

std::unique_ptr<PipeMessage> ItemMessage::clone() const
{
    return std::make_unique<ItemMessage>(value, flag, text);
}

TextTripleMessage::TextTripleMessage(MessageText newText1, MessageText newText2, MessageText newText3)
    : PipeMessage(MessageKind::textTriple, EventType::textTriple), text1(std::move(newText1)),
      text2(std::move(newText2)), text3(std::move(newText3))
{
}

void TextTripleMessage::serialize(MessageBuffer& buffer) const
{
    const std::string texts[] = {bytesOf(text1), bytesOf(text2), bytesOf(text3)};
    FrameWriter frame(buffer, type(), kMinPayloadBytes, {texts[0], texts[1], texts[2]});
    for (const std::string& text : texts)
        frame.count(text);
    for (const std::string& text : texts)
        frame.bytes(text);
}

std::unique_ptr<PipeMessage> TextTripleMessage::clone() const
{
    return std::make_unique<TextTripleMessage>(text1, text2, text3);
}

CounterMessage::CounterMessage(std::uint32_t newCode, std::uint64_t newValue1, std::uint64_t newValue2,
                               std::uint32_t newFlag)
    : PipeMessage(MessageKind::counter, EventType::counter), code(newCode), value1(newValue1), value2(newValue2),
      flag(newFlag)
{
}

void CounterMessage::serialize(MessageBuffer& buffer) const
{
    FrameWriter frame(buffer, type(), kMinPayloadBytes);
    frame.u32(code);
    frame.u64(value1);
    frame.u64(value2);
    frame.u32(flag);
}

std::unique_ptr<PipeMessage> CounterMessage::clone() const
{
    return std::make_unique<CounterMessage>(code, value1, value2, flag);
}

std::unique_ptr<PipeMessage> createMessage(std::uint32_t number, const MessageBuffer& buffer)
{
    if (!isEventType(number) || !buffer.data())
        return nullptr;
    const auto type = static_cast<EventType>(number);
    const MessageKind kind = kindOf(type);
    if (buffer.length() < minPayloadBytes(kind))
        return nullptr;
    PayloadReader payload(buffer);
    switch (kind) {
    case MessageKind::event: {
        const std::uint32_t code = payload.u32();
        const std::uint64_t value = payload.u64();
        const std::uint32_t flag = payload.u32();
        return std::make_unique<EventMessage>(type, code, value, flag, payload.text(payload.u32()));
    }
    case MessageKind::snapshot: {
        const std::uint32_t state = payload.u32();
        std::uint64_t counters[4];
        for (std::uint64_t& counter : counters)
            counter = payload.u64();
        return std::make_unique<SnapshotMessage>(state, counters[0], counters[1], counters[2], counters[3]);
    }
    case MessageKind::item: {
        const std::uint64_t value = payload.u64();
        const bool flag = payload.u32() != 0;
        return std::make_unique<ItemMessage>(value, flag, payload.text(payload.u32()));
    }
    case MessageKind::textTriple: {
        std::uint32_t counts[3];
        for (std::uint32_t& count : counts)
            count = payload.u32();
        MessageText texts[3];
        for (int i = 0; i < 3; ++i)
            texts[i] = payload.text(counts[i]);
        return std::make_unique<TextTripleMessage>(texts[0], texts[1], texts[2]);
    }
    case MessageKind::counter: {
        const std::uint32_t code = payload.u32();
        const std::uint64_t value1 = payload.u64();
        const std::uint64_t value2 = payload.u64();
        return std::make_unique<CounterMessage>(code, value1, value2, payload.u32());
    }
    }
    return nullptr;
}

} // namespace tavi
