#pragma once

#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// The pipe for commands to the service: one message per connection and no reply. Never waits for a busy or absent
// service. Any thread.
class CommandPipe {
  public:
    // Returns true if the message was written. Destroys the message, unless the pipe cannot be opened: this is logged,
    // and the caller keeps the message.
    static bool sendCommand(std::unique_ptr<PipeMessage>& message);

    // Returns the command that ends the running restore.
    static std::unique_ptr<PipeMessage> cancelRestore();
};

} // namespace tavi
