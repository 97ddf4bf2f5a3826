#include "link/StatusListener.h"

#include <atomic>

#include <windows.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "link/PipeIo.h"

namespace tavi {
namespace {

constexpr const wchar_t* kStatusPipe = L"\\\\.\\pipe\\tavistatus";
constexpr DWORD kRetryMilliseconds = 5000;
constexpr DWORD kStopPollMilliseconds = 50;
constexpr DWORD kHangUpMilliseconds = 10;

std::atomic<MessageSink> messageSink{nullptr};

// Two threads may be first: both make one, and one of the two stays.
class LazyStatus {
  public:
    ~LazyStatus()
    {
        delete status_.load();
    }
    TransferStatus& get()
    {
        TransferStatus* status = status_.load();
        if (!status) {
            auto made =
                std::make_unique<TransferStatus>(true, [] { return static_cast<std::uint32_t>(GetTickCount()); });
            if (status_.compare_exchange_strong(status, made.get()))
                status = made.release();
        }
        return *status;
    }

  private:
    std::atomic<TransferStatus*> status_{nullptr};
};
LazyStatus lazyStatus;

FileHandle openStatusPipe() noexcept
{
    return FileHandle(
        CreateFileW(kStatusPipe, GENERIC_READ, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
}

void waitForRetry(const StopCheck& stopCheck)
{
    for (DWORD waited = 0; waited < kRetryMilliseconds && !stopCheck(); waited += kStopPollMilliseconds)
        Sleep(kStopPollMilliseconds);
}

// Until the connection fails, brings something that is no message, or is no longer wanted.
void followConnection(HANDLE pipe, const StopCheck& stopCheck)
{
    std::unique_ptr<PipeMessage> message;
    while (!stopCheck() && readMessage(pipe, &message, stopCheck))
        dispatch(std::move(message));
}

} // namespace

TransferStatus& transferStatus()
{
    return lazyStatus.get();
}

void setMessageSink(MessageSink sink) noexcept
{
    messageSink = sink;
}

void dispatch(std::unique_ptr<PipeMessage> message)
{
    transferStatus().apply(*message);
    if (const MessageSink sink = messageSink)
        sink(std::move(message));
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
        // One message too many for the memory there is must not silence the rest.
        const bool survived = guarded("status connection", false, [&] {
            followConnection(pipe.get(), stopCheck);
            return true;
        });
        pipe = FileHandle();
        if (stopCheck())
            return;
        // The next attempt follows at once, unless this one has logged an error: its cause is likely still there. A
        // peer that hangs up before the first pause of the reader must not make that a busy loop.
        if (!survived)
            waitForRetry(stopCheck);
        else if (GetTickCount() == start)
            Sleep(kHangUpMilliseconds);
    }
}

} // namespace tavi
