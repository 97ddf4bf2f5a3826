#include "link/CommandPipe.h"

#include <windows.h>

#include "core/Handles.h"
#include "core/LogLine.h"
#include "link/PipeIo.h"

namespace tavi {
namespace {

constexpr const wchar_t* kCommandPipe = L"\\\\.\\pipe\\tavibackup";

} // namespace

bool sendCommand(std::unique_ptr<PipeMessage>& message)
{
    const FileHandle pipe(
        CreateFileW(kCommandPipe, GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
    if (!pipe) {
        logError(L"Unable to open command pipe: %d", static_cast<int>(GetLastError()));
        return false;
    }
    const bool written = writeMessage(pipe.get(), message);
    message.reset();
    return written;
}

std::unique_ptr<PipeMessage> cancelRestoreCommand()
{
    return std::make_unique<EventMessage>(EventType::restoreEnded);
}

} // namespace tavi
