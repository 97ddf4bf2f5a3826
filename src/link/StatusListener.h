#pragma once

#include <memory>

#include "link/MessageReader.h"
#include "link/TransferStatus.h"

namespace tavi {

// The process-wide picture of the running transfer, made on first use; lives as long as the module is loaded. Any
// thread.
TransferStatus& transferStatus();

// Where messages go once the status has taken them: owns what it is given. Called on the listener's thread, which must
// not be made to wait. Null: nowhere.
using MessageSink = void (*)(std::unique_ptr<PipeMessage> message);
void setMessageSink(MessageSink sink) noexcept;

// Applies one message to the status and passes it on.
void dispatch(std::unique_ptr<PipeMessage> message);

// The listener's thread routine: keeps the service's status pipe open and dispatches what arrives until the check says
// stop.
void listenToStatus(const StopCheck& stopCheck);

} // namespace tavi
