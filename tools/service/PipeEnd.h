#pragma once

#include <windows.h>

#include <memory>
#include <string>
#include <string_view>

namespace service {

struct HandleCloser {
    using pointer = HANDLE;
    void operator()(HANDLE handle) const
    {
        CloseHandle(handle);
    }
};
using Handle = std::unique_ptr<HANDLE, HandleCloser>;

Handle makeEvent();

// The server's end of one instance of a pipe. Every call ends at once, with false, when `stop` is signalled.
class PipeEnd {
  public:
    // `access` is PIPE_ACCESS_INBOUND and so on. Throws when the instance cannot be made.
    PipeEnd(const wchar_t* name, DWORD access, HANDLE stop, DWORD instances = PIPE_UNLIMITED_INSTANCES);

    bool connect();
    bool write(std::string_view bytes, DWORD milliseconds = INFINITE);
    // One read of at most `most` bytes; false when the client has gone or nothing came in time.
    bool read(std::string& bytes, DWORD most, DWORD milliseconds);
    void disconnect();

  private:
    bool finish(BOOL done, DWORD milliseconds, DWORD& count);

    Handle pipe_;
    HANDLE stop_;
    Handle event_;
    OVERLAPPED overlapped_{};
};

} // namespace service
