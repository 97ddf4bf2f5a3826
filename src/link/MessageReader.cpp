#include "link/MessageReader.h"

#include <algorithm>

namespace tavi {
namespace {

std::uint32_t u32At(const unsigned char* bytes) noexcept
{
    return bytes[0] | std::uint32_t{bytes[1]} << 8 | std::uint32_t{bytes[2]} << 16 | std::uint32_t{bytes[3]} << 24;
}

} // namespace

std::unique_ptr<PipeMessage> readFrame(ByteSource& source, const StopCheck& stopCheck)
{
    const auto stopped = [&] { return stopCheck && stopCheck(); };
    const auto buffer = MessageBuffer::create();

    // Pauses once even if bytes are available: this limits how often a peer can wake the reader.
    std::uint32_t available = 0;
    while (available == 0) {
        if (!source.peek(available))
            return nullptr;
        source.pause();
        if (stopped())
            return nullptr;
    }
    unsigned char header[kFrameHeaderSize] = {};
    if (!source.read(header, sizeof(header)) || stopped())
        return nullptr;

    // Reading at once could wait without end for a payload that the peer never sends, and no stop request ends a read.
    // No kind of message has an empty payload.
    const std::uint32_t length = u32At(header + 4);
    if (length == 0 || !source.peek(available))
        return nullptr;
    while (available == 0) {
        source.pause();
        if (stopped() || !source.peek(available))
            return nullptr;
    }
    // A text may extend to the end of the buffer, so a buffer beyond the bytes received would add zeros to it.
    buffer->ensure(std::min(length, available));
    if (!buffer->data() || !source.read(buffer->data(), std::min(length, buffer->capacity())))
        return nullptr;
    // The announced length, not the number of bytes received: a payload cut short is read with zeros for the rest.
    buffer->setLength(length);
    return createMessage(u32At(header), *buffer);
}

} // namespace tavi
