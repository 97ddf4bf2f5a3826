#include "link/PipeIo.h"

namespace tavi {
namespace {

constexpr DWORD kPollMs = 10;

bool isUsable(HANDLE pipe) noexcept
{
    return pipe && pipe != INVALID_HANDLE_VALUE;
}

class PipeSource final : public ByteSource {
  public:
    explicit PipeSource(HANDLE pipe) noexcept : pipe_(pipe) {}
    bool peek(std::uint32_t& available) override
    {
        DWORD count = 0;
        const bool open = PeekNamedPipe(pipe_, nullptr, 0, nullptr, &count, nullptr);
        available = count;
        return open;
    }
    void pause() override
    {
        Sleep(kPollMs);
    }
    bool read(unsigned char* into, std::uint32_t size) override
    {
        DWORD count = 0;
        return ReadFile(pipe_, into, size, &count, nullptr);
    }

  private:
    const HANDLE pipe_;
};

} // namespace

bool readMessage(HANDLE pipe, std::unique_ptr<PipeMessage>* message, const StopCheck& stopCheck)
{
    if (!message)
        return false;
    message->reset();
    if (!isUsable(pipe))
        return false;
    PipeSource source(pipe);
    *message = readFrame(source, stopCheck);
    return *message != nullptr;
}

bool writeMessage(HANDLE pipe, std::unique_ptr<PipeMessage>& message)
{
    if (!message || !isUsable(pipe))
        return false;
    const auto buffer = MessageBuffer::create();
    message->serialize(*buffer);
    DWORD written = 0;
    if (!buffer->data() || !WriteFile(pipe, buffer->data(), buffer->length(), &written, nullptr))
        return false;
    message.reset();
    return true;
}

} // namespace tavi
