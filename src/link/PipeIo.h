#pragma once

#include <memory>

#include <windows.h>

#include "link/MessageReader.h"
#include "link/PipeMessage.h"

namespace tavi {

// Waits for one message of the pipe; false, with no message, when the pipe failed, the frame was none, or the check
// said stop. Without a check only the pipe ends the wait: no thread of the module belongs to a framework that could be
// asked instead. With `overlapped`, whose event is the caller's, the handle must have been opened for overlapped use.
bool readMessage(HANDLE pipe, std::unique_ptr<PipeMessage>* message, const StopCheck& stopCheck,
                 OVERLAPPED* overlapped = nullptr);

// Writes the message in one piece. On success the message is destroyed; on failure it stays with the caller.
bool writeMessage(HANDLE pipe, std::unique_ptr<PipeMessage>& message);

} // namespace tavi
