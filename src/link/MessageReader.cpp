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

    // One pause even when bytes are there already: it also limits how fast a peer can make the reader work.
    std::uint32_t available = 0;
    while (available == 0) {
        if (!source.peek(available))
            return nullptr;
        source.pause();
        if (stopped())
            return nullptr;
    }
    unsigned char header[kFrameHeaderSize] = {};
    if (!source.startRead(header, sizeof(header)))
        return nullptr;
    if (stopped()) {
        source.abandonRead();
        return nullptr;
    }
    if (!source.finishRead() || stopped())
        return nullptr;

    // A read would wait for a payload that never comes, deaf to the stop request. No kind has an empty one.
    const std::uint32_t length = u32At(header + 4);
    if (length == 0 || !source.peek(available))
        return nullptr;
    while (available == 0) {
        source.pause();
        if (stopped() || !source.peek(available))
            return nullptr;
    }
    // A text count may reach to the end of the buffer: room for bytes that are not there would become text.
    buffer->ensure(std::min(length, available));
    if (!buffer->data() || !source.startRead(buffer->data(), std::min(length, buffer->capacity())) ||
        !source.finishRead())
        return nullptr;
    // As announced: what was delivered is not counted, and the rest reads as whatever the buffer holds.
    buffer->setLength(length);
    return createMessage(u32At(header), *buffer);
}

} // namespace tavi
