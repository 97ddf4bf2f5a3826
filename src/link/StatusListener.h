#pragma once

#include <memory>

#include "link/MessageReader.h"
#include "link/TransferStatus.h"

namespace tavi {

// Returns the transfer status of the process. The first call creates it; it lives until the module is unmapped. Any
// thread.
TransferStatus& transferStatus();

// Receives each message after the status has applied it, on the listener's thread, and must not wait.
using MessageSink = void (*)(const PipeMessage& message);
// Null for none.
void setMessageSink(MessageSink sink) noexcept;

// Applies a message to the status, shows it to the sink and destroys it.
void dispatch(std::unique_ptr<PipeMessage> message);

// Runs the listener: connects to the service's status pipe again and again and dispatches its messages, until the check
// returns true.
void listenToStatus(const StopCheck& stopCheck);

} // namespace tavi
