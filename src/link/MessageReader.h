#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// Returns true when the reader must give up. Called every few milliseconds.
using StopCheck = std::function<bool()>;

// The bytes that a reader of frames receives, as a rule from a pipe.
class ByteSource {
  public:
    virtual ~ByteSource() = default;
    // Stores the number of bytes that can be read now. Returns false when there will be no more.
    virtual bool peek(std::uint32_t& available) = 0;
    // Waits a few milliseconds.
    virtual void pause() = 0;
    // Waits for bytes and reads up to `size` of them. Returns false on failure.
    virtual bool read(unsigned char* into, std::uint32_t size) = 0;
};

// Waits for one frame and returns its message. Returns null if the source has ended, the frame is malformed or the
// check returned true; the caller then closes the source. The reader allocates only as many bytes as the peer has sent.
std::unique_ptr<PipeMessage> readFrame(ByteSource& source, const StopCheck& stopCheck);

} // namespace tavi
