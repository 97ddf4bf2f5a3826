#pragma once

#include <memory>

#include "link/PipeMessage.h"

namespace tavi {

// Sends one message to the service over the command pipe, which has no reply. Returns true if it was written. Destroys
// the message, unless the pipe cannot be opened: this is logged, and the caller keeps the message. Does not wait for a
// busy or absent service; waits for one that does not read. Any thread.
bool sendCommand(std::unique_ptr<PipeMessage>& message);

// Returns the command that ends the running restore.
std::unique_ptr<PipeMessage> cancelRestoreCommand();

} // namespace tavi
