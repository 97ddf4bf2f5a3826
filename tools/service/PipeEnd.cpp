#include "PipeEnd.h"

#include "Text.h"

namespace service {

Handle makeEvent()
{
    return Handle(CreateEventW(nullptr, TRUE, FALSE, nullptr));
}

PipeEnd::PipeEnd(const wchar_t* name, DWORD access, HANDLE stop, DWORD instances) : stop_(stop), event_(makeEvent())
{
    const HANDLE pipe = CreateNamedPipeW(name, access | FILE_FLAG_OVERLAPPED, PIPE_TYPE_BYTE | PIPE_WAIT, instances,
                                         65536, 65536, 0, nullptr);
    if (pipe == INVALID_HANDLE_VALUE)
        throw systemFailure(name, GetLastError());
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
    overlapped_ = {};
    overlapped_.hEvent = event_.get();
    DWORD count = 0;
    const BOOL done = ConnectNamedPipe(pipe_.get(), &overlapped_);
    return (!done && GetLastError() == ERROR_PIPE_CONNECTED) || finish(done, INFINITE, count);
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

bool PipeEnd::read(std::string& bytes, DWORD most, DWORD milliseconds)
{
    bytes.resize(most);
    overlapped_ = {};
    overlapped_.hEvent = event_.get();
    DWORD count = 0;
    const BOOL done = ReadFile(pipe_.get(), bytes.data(), most, nullptr, &overlapped_);
    const bool read = finish(done, milliseconds, count);
    bytes.resize(read ? count : 0);
    return read;
}

void PipeEnd::disconnect()
{
    DisconnectNamedPipe(pipe_.get());
}

} // namespace service
