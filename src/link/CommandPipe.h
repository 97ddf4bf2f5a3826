#pragma once

#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// The only way to tell the service to do something: one message per connection, nothing read back, no waiting for a
// busy or absent service. Any thread.
class CommandPipe {
  public:
    // True when the message was written. It is destroyed, written or not, unless the pipe cannot be opened: that is
    // logged, and the message is left as it is.
    static bool sendCommand(std::unique_ptr<PipeMessage>& message);

    // The command that stops the running restore.
    static std::unique_ptr<PipeMessage> cancelRestore();
};

} // namespace tavi
