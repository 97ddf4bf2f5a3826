#include "Commands.h"

#include "Messages.h"
#include "Text.h"

namespace service {
namespace {

constexpr wchar_t kCommandPipe[] = L"\\\\.\\pipe\\tavibackup";
constexpr int kInstances = 4;
constexpr DWORD kPatience = 2000;
// More than any command has.
constexpr DWORD kLongest = 1024;

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
    std::vector<std::unique_ptr<PipeEnd>> pipes;
    for (int i = 0; i < kInstances; ++i)
        pipes.push_back(std::make_unique<PipeEnd>(kCommandPipe, PIPE_ACCESS_INBOUND, stop_.get()));
    for (auto& made : pipes)
        threads_.emplace_back([this, pipe = std::move(made)] { serve(*pipe); });
}

CommandServer::~CommandServer()
{
    SetEvent(stop_.get());
    for (std::thread& thread : threads_)
        thread.join();
}

void CommandServer::serve(PipeEnd& pipe)
{
    while (pipe.connect() || WaitForSingleObject(stop_.get(), 10) == WAIT_TIMEOUT) {
        std::string frame, part;
        // One time limit for the whole frame: a client that sends it byte by byte must not keep the instance.
        const DWORD start = GetTickCount();
        for (DWORD spent = 0; frame.size() < kLongest && !isCancelCommand(frame) && spent < kPatience &&
                              pipe.read(part, kLongest, kPatience - spent);
             spent = GetTickCount() - start)
            frame += part;
        pipe.disconnect();
        if (frame.empty())
            continue;
        std::wstring answer = L"refused";
        try {
            if (isCancelCommand(frame))
                answer = cancel_() ? L"cancel" : L"nothing to cancel";
        } catch (const Failure& failure) {
            answer = failure.text;
        }
        print(L"command " + hexOf(frame.substr(0, 64)) + L": " + answer + L"\n");
    }
}

} // namespace service
