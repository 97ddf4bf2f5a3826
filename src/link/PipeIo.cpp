#include "link/PipeIo.h"

namespace tavi {
namespace {

constexpr DWORD kPollMilliseconds = 10;

bool isUsable(HANDLE pipe) noexcept
{
    return pipe && pipe != INVALID_HANDLE_VALUE;
}

class PipeSource final : public ByteSource {
  public:
    PipeSource(HANDLE pipe, OVERLAPPED* overlapped) noexcept : pipe_(pipe), overlapped_(overlapped) {}
    bool peek(std::uint32_t& available) override
    {
        DWORD count = 0;
        const bool open = PeekNamedPipe(pipe_, nullptr, 0, nullptr, &count, nullptr);
        available = count;
        return open;
    }
    void pause() override
    {
        Sleep(kPollMilliseconds);
    }
    bool startRead(unsigned char* into, std::uint32_t size) override
    {
        DWORD count = 0;
        return ReadFile(pipe_, into, size, overlapped_ ? nullptr : &count, overlapped_) ||
               (overlapped_ && GetLastError() == ERROR_IO_PENDING);
    }
    bool finishRead() override
    {
        DWORD count = 0;
        return !overlapped_ || GetOverlappedResult(pipe_, overlapped_, &count, TRUE);
    }
    void abandonRead() override
    {
        // The system must have let go of the bytes before they go.
        if (overlapped_) {
            CancelIo(pipe_);
            finishRead();
        }
    }

  private:
    const HANDLE pipe_;
    OVERLAPPED* const overlapped_;
};

} // namespace

bool readMessage(HANDLE pipe, std::unique_ptr<PipeMessage>* message, const StopCheck& stopCheck, OVERLAPPED* overlapped)
{
    if (!message)
        return false;
    message->reset();
    if (!isUsable(pipe))
        return false;
    PipeSource source(pipe, overlapped);
    *message = readFrame(source, stopCheck);
    return *message != nullptr;
}

bool writeMessage(HANDLE pipe, std::unique_ptr<PipeMessage>& message)
{
    if (!message || !isUsable(pipe))
        return false;
    const auto buffer = MessageBuffer::create();
    message->serialise(*buffer);
    DWORD written = 0;
    if (!buffer->data() || !WriteFile(pipe, buffer->data(), buffer->length(), &written, nullptr))
        return false;
    message.reset();
    return true;
}

} // namespace tavi
