#include "CommandServer.h"

#include <memory>

#include "common/Text.h"
#include "Messages.h"

namespace service {
namespace {

constexpr wchar_t kCommandPipe[] = L"\\\\.\\pipe\\tavibackup";
constexpr int kInstances = 4;
constexpr DWORD kFrameMs = 10000;
// More than any command has.
constexpr DWORD kMaxFrameBytes = 1024;

std::wstring hexOf(const std::string& bytes)
{
    std::wstring text;
    for (const char byte : bytes) {
        text += L"0123456789abcdef"[static_cast<unsigned char>(byte) >> 4];
        text += L"0123456789abcdef"[byte & 15];
    }
    return text;
}

} // namespace

CommandServer::CommandServer(std::function<bool()> cancel) : cancel_(std::move(cancel))
{
    for (int i = 0; i < kInstances; ++i) {
        auto pipe = std::make_unique<PipeEnd>(kCommandPipe, PIPE_ACCESS_INBOUND, stop_.get());
        threads_.emplace_back([this, pipe = std::move(pipe)] { serve(*pipe); });
    }
}

CommandServer::~CommandServer()
{
    SetEvent(stop_.get());
    for (std::thread& thread : threads_)
        thread.join();
}

void CommandServer::serve(PipeEnd& pipe)
{
    while (pipe.connect()) {
        std::string frame;
        std::string part;
        while (frame.size() < kMaxFrameBytes && !isCancelCommand(frame) && pipe.read(part, kMaxFrameBytes, kFrameMs))
            frame += part;
        pipe.disconnect();
        std::wstring answer = L"refused";
        try {
            if (isCancelCommand(frame))
                answer = cancel_() ? L"cancel" : L"nothing to cancel";
        } catch (const tools::Failure& failure) {
            answer = failure.text;
        }
        tools::print(L"command " + hexOf(frame) + L": " + answer);
    }
}

} // namespace service
