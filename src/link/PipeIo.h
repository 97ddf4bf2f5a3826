#pragma once

#include <memory>

#include <windows.h>

#include "link/MessageReader.h"
#include "link/PipeMessage.h"

namespace tavi {

// Waits for one message from the pipe. Returns false, with no message, if the pipe failed, the frame was malformed or
// the check returned true. With an empty check only the pipe ends the wait.
bool readMessage(HANDLE pipe, std::unique_ptr<PipeMessage>* message, const StopCheck& stopCheck);

// Writes the message with one call. Destroys it on success; on failure the caller keeps it.
bool writeMessage(HANDLE pipe, std::unique_ptr<PipeMessage>& message);

} // namespace tavi
