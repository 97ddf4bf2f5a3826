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
    for (int i = 0; i < kInstances; ++i)
        threads_.emplace_back([this] { serve(); });
}

CommandServer::~CommandServer()
{
    SetEvent(stop_.get());
    for (std::thread& thread : threads_)
        thread.join();
}

void CommandServer::serve()
{
    PipeEnd pipe(kCommandPipe, PIPE_ACCESS_INBOUND, stop_.get());
    while (pipe.connect() || WaitForSingleObject(stop_.get(), 10) == WAIT_TIMEOUT) {
        std::string frame, part;
        while (frame.size() < kLongest && pipe.read(part, kLongest, kPatience))
            frame += part;
        pipe.disconnect();
        if (frame.empty())
            continue;
        const wchar_t* const answer = !isCancelCommand(frame) ? L"refused"
                                      : cancel_()             ? L"cancel"
                                                              : L"nothing to cancel";
        print(L"command " + hexOf(frame.substr(0, 64)) + L": " + answer + L"\n");
    }
}

} // namespace service
