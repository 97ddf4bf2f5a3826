#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// True when the reader must give up. Asked every few milliseconds.
using StopCheck = std::function<bool()>;

// Where frames come from: one end of a pipe.
class ByteSource {
  public:
    virtual ~ByteSource() = default;
    // How many bytes can be read now; false when there will be no more.
    virtual bool peek(std::uint32_t& available) = 0;
    // One step of waiting for bytes.
    virtual void pause() = 0;
    // Begins one read, which may deliver fewer bytes than asked for; false when it cannot. A read that was begun is
    // either finished or abandoned before `into` goes.
    virtual bool startRead(unsigned char* into, std::uint32_t size) = 0;
    virtual bool finishRead() = 0;
    virtual void abandonRead() = 0;
};

// Waits for one frame and makes its message. Null when the source has ended, the frame is none, or the check said stop;
// the source is then of no more use. What a peer announces costs memory only as far as it delivers.
std::unique_ptr<PipeMessage> readFrame(ByteSource& source, const StopCheck& stopCheck);

} // namespace tavi
