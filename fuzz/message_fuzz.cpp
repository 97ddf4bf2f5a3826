#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "link/MessageReader.h"
#include "link/TransferStatus.h"

namespace {

using namespace tavi;

// A peer that sends the input. Every read but the first returns at most as many bytes as its first byte says, plus one.
class Peer : public ByteSource {
  public:
    Peer(const std::uint8_t* bytes, std::size_t length) : bytes_(bytes), length_(length) {}
    bool peek(std::uint32_t& available) override
    {
        available = static_cast<std::uint32_t>(std::min(length_, part_));
        return length_ > 0;
    }
    void pause() override {}
    bool read(unsigned char* into, std::uint32_t size) override
    {
        const std::size_t count = std::min({std::size_t{size}, length_, part_});
        std::memcpy(into, bytes_, count);
        bytes_ += count;
        length_ -= count;
        part_ = length_ > 0 ? std::size_t{bytes_[0]} + 1 : 1;
        return count > 0;
    }

  private:
    const std::uint8_t* bytes_;
    std::size_t length_;
    std::size_t part_ = SIZE_MAX;
};

std::uint32_t clock()
{
    static std::uint32_t ticks = 0;
    return ticks += 100;
}

} // namespace

// Applies every message to a status. A message that is serialized, read and serialized again must have the same bytes.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t length)
{
    static TransferStatus status(false, clock);
    Peer peer(bytes, length);
    while (const auto message = readFrame(peer, nullptr)) {
        status.apply(*message);
        status.timerTick();
        (void)status.remainingSeconds();
        (void)status.barPosition();
        (void)status.restoreSpeed();
        (void)status.restoreText.get();
        const auto once = MessageBuffer::create(), again = MessageBuffer::create(), payload = MessageBuffer::create();
        message->clone()->serialize(*once);
        payload->ensure(once->length());
        payload->setLength(once->length() - kFrameHeaderSize);
        std::memcpy(payload->data(), once->data() + kFrameHeaderSize, payload->length());
        createMessage(static_cast<std::uint32_t>(message->type()), *payload)->serialize(*again);
        if (once->length() != again->length() || std::memcmp(once->data(), again->data(), once->length()) != 0)
            std::abort();
    }
    return 0;
}
