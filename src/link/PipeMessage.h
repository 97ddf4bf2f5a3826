#pragma once

#include <cstdint>
#include <memory>

#include <wx/string.h>

#include "link/EventType.h"
#include "link/MessageBuffer.h"

// The framed messages of both pipes. A frame is an 8-byte header (type, number of payload bytes) and the payload.
// Integers are little-endian; a text is a number of bytes and so much UTF-8. A message belongs to one thread at a time.
namespace tavi {

enum class MessageKind : std::uint32_t { event = 0, snapshot = 1, item = 2, textTriple = 3, counter = 4 };

constexpr std::uint32_t kFrameHeaderSize = 8;

// Shared between a message and its clones.
using MessageText = std::shared_ptr<const wxString>;

class PipeMessage {
  public:
    PipeMessage(const PipeMessage&) = delete;
    PipeMessage& operator=(const PipeMessage&) = delete;

    // Writes header and payload. The buffer's length becomes the size of the frame, or 0 if the buffer could not grow.
    virtual void serialize(MessageBuffer& buffer) const = 0;
    virtual std::unique_ptr<PipeMessage> clone() const = 0;
    virtual ~PipeMessage() = default;

    MessageKind kind() const noexcept
    {
        return kind_;
    }
    EventType type() const noexcept
    {
        return type_;
    }

  protected:
    PipeMessage(MessageKind kind, EventType type) noexcept : kind_(kind), type_(type) {}

  private:
    const MessageKind kind_;
    const EventType type_;
};

class EventMessage final : public PipeMessage {
  public:
    static constexpr std::uint32_t kMinPayloadBytes = 20;

    // With 0 in every number and an empty text.
    explicit EventMessage(EventType type);
    EventMessage(EventType type, std::uint32_t code, std::uint64_t value, std::uint32_t flag, MessageText text);
    void serialize(MessageBuffer& buffer) const override;
    std::unique_ptr<PipeMessage> clone() const override;

    const std::uint32_t code;
    const std::uint64_t value;
    const std::uint32_t flag;
    const MessageText text;
};

class SnapshotMessage final : public PipeMessage {
  public:
    static constexpr std::uint32_t kMinPayloadBytes = 36;

    SnapshotMessage(std::uint32_t state, std::uint64_t counter0, std::uint64_t counter1, std::uint64_t counter2,
                    std::uint64_t counter3);
    void serialize(MessageBuffer& buffer) const override;
    std::unique_ptr<PipeMessage> clone() const override;

    const std::uint32_t state;
    const std::uint64_t counter0;
    const std::uint64_t counter1;
    const std::uint64_t counter2;
    const std::uint64_t counter3;
};

class ItemMessage final : public PipeMessage {
  public:
    static constexpr std::uint32_t kMinPayloadBytes = 16;

    ItemMessage(std::uint64_t value, bool flag, MessageText text);
    void serialize(MessageBuffer& buffer) const override;
    std::unique_ptr<PipeMessage> clone() const override;

    const std::uint64_t value;
    const bool flag;
    const MessageText text;
};

class TextTripleMessage final : public PipeMessage {
  public:
    static constexpr std::uint32_t kMinPayloadBytes = 12;

    TextTripleMessage(MessageText text1, MessageText text2, MessageText text3);
    void serialize(MessageBuffer& buffer) const override;
    std::unique_ptr<PipeMessage> clone() const override;

    const MessageText text1;
    const MessageText text2;
    const MessageText text3;
};

class CounterMessage final : public PipeMessage {
  public:
    static constexpr std::uint32_t kMinPayloadBytes = 24;

    CounterMessage(std::uint32_t code, std::uint64_t value1, std::uint64_t value2, std::uint32_t flag);
    void serialize(MessageBuffer& buffer) const override;
    std::unique_ptr<PipeMessage> clone() const override;

    const std::uint32_t code;
    const std::uint64_t value1;
    const std::uint64_t value2;
    const std::uint32_t flag;
};

// Creates the message of a received frame from its type and payload. Returns null if the type is not one of EventType
// or the announced length is too small for its kind. A text may extend beyond that length, but not beyond the buffer.
std::unique_ptr<PipeMessage> createMessage(std::uint32_t type, const MessageBuffer& payload);

} // namespace tavi
