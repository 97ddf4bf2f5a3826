#include "PipeEnd.h"

#include "common/Text.h"

namespace service {

PipeEnd::PipeEnd(const wchar_t* name, DWORD access, HANDLE stop) : stop_(stop), event_(tools::createEvent())
{
    const HANDLE pipe = CreateNamedPipeW(name, access | FILE_FLAG_OVERLAPPED, PIPE_TYPE_BYTE | PIPE_WAIT,
                                         PIPE_UNLIMITED_INSTANCES, 65536, 65536, 0, nullptr);
    if (pipe == INVALID_HANDLE_VALUE)
        throw tools::systemFailure(name, GetLastError());
    pipe_.reset(pipe);
}

bool PipeEnd::finish(BOOL done, DWORD milliseconds, DWORD& count)
{
    if (!done && GetLastError() != ERROR_IO_PENDING)
        return false;
    const HANDLE events[] = {stop_, event_.get()};
    const bool ready = WaitForMultipleObjects(2, events, FALSE, milliseconds) == WAIT_OBJECT_0 + 1;
    if (!ready)
        CancelIo(pipe_.get());
    return GetOverlappedResult(pipe_.get(), &overlapped_, &count, TRUE) && ready;
}

bool PipeEnd::connect()
{
    constexpr DWORD kRetryMs = 10;
    do {
        overlapped_ = {};
        overlapped_.hEvent = event_.get();
        DWORD count = 0;
        const BOOL done = ConnectNamedPipe(pipe_.get(), &overlapped_);
        if ((!done && GetLastError() == ERROR_PIPE_CONNECTED) || finish(done, INFINITE, count))
            return true;
        // A client that connected and went away keeps the instance until this.
        DisconnectNamedPipe(pipe_.get());
    } while (WaitForSingleObject(stop_, kRetryMs) == WAIT_TIMEOUT);
    return false;
}

bool PipeEnd::write(std::string_view bytes, DWORD milliseconds)
{
    while (!bytes.empty()) {
        overlapped_ = {};
        overlapped_.hEvent = event_.get();
        DWORD count = 0;
        const BOOL done = WriteFile(pipe_.get(), bytes.data(), static_cast<DWORD>(bytes.size()), nullptr, &overlapped_);
        if (!finish(done, milliseconds, count) || count == 0)
            return false;
        bytes.remove_prefix(count);
    }
    return true;
}

bool PipeEnd::read(std::string& bytes, DWORD limit, DWORD milliseconds)
{
    bytes.resize(limit);
    overlapped_ = {};
    overlapped_.hEvent = event_.get();
    DWORD count = 0;
    const BOOL done = ReadFile(pipe_.get(), bytes.data(), limit, nullptr, &overlapped_);
    const bool read = finish(done, milliseconds, count);
    bytes.resize(read ? count : 0);
    return read;
}

void PipeEnd::disconnect()
{
    DisconnectNamedPipe(pipe_.get());
}

} // namespace service
