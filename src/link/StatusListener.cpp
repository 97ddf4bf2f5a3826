#include "link/StatusListener.h"

#include <atomic>

#include <windows.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/InitializeOnce.h"
#include "link/PipeIo.h"

namespace tavi {
namespace {

constexpr const wchar_t* kStatusPipe = L"\\\\.\\pipe\\tavistatus";
constexpr DWORD kRetryMs = 5000;
constexpr DWORD kStopPollMs = 50;
constexpr DWORD kHangUpMs = 10;

std::atomic<MessageSink> messageSink{nullptr};

// Destroyed when the module is unmapped.
struct SharedStatus {
    std::atomic<TransferStatus*> status{nullptr};
    ~SharedStatus()
    {
        delete status.load();
    }
} sharedStatus;

FileHandle openStatusPipe() noexcept
{
    return FileHandle(
        CreateFileW(kStatusPipe, GENERIC_READ, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
}

void waitForRetry(const StopCheck& stopCheck)
{
    for (DWORD waited = 0; waited < kRetryMs && !stopCheck(); waited += kStopPollMs)
        Sleep(kStopPollMs);
}

// Dispatches messages until the connection fails, a frame is malformed or the check returns true.
void followConnection(HANDLE pipe, const StopCheck& stopCheck)
{
    std::unique_ptr<PipeMessage> message;
    while (!stopCheck() && readMessage(pipe, &message, stopCheck))
        dispatch(std::move(message));
}

} // namespace

TransferStatus& transferStatus()
{
    return *initializeOnce(sharedStatus.status, [] {
        return std::make_unique<TransferStatus>(true, [] { return static_cast<std::uint32_t>(GetTickCount()); });
    });
}

void setMessageSink(MessageSink sink) noexcept
{
    messageSink = sink;
}

void dispatch(std::unique_ptr<PipeMessage> message)
{
    transferStatus().apply(*message);
    if (const MessageSink sink = messageSink)
        sink(*message);
}

void listenToStatus(const StopCheck& stopCheck)
{
    while (true) {
        FileHandle pipe = openStatusPipe();
        while (!pipe) {
            if (stopCheck())
                return;
            waitForRetry(stopCheck);
            pipe = openStatusPipe();
        }
        const DWORD start = GetTickCount();
        // If memory runs out for one message, the next connection still brings the others.
        const bool survived = guarded("status connection", false, [&] {
            followConnection(pipe.get(), stopCheck);
            return true;
        });
        pipe = FileHandle();
        if (stopCheck())
            return;
        // Reconnects at once, but waits after an exception, whose cause probably persists, and pauses after a peer that
        // hung up before the reader's first pause: that would be a busy loop.
        if (!survived)
            waitForRetry(stopCheck);
        else if (GetTickCount() == start)
            Sleep(kHangUpMs);
    }
}

} // namespace tavi
