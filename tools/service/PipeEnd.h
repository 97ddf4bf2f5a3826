#pragma once

#include <string>
#include <string_view>

#include <windows.h>

#include "common/Handle.h"

namespace service {

// The server's end of one instance of a pipe. Every call returns false at once when `stop` is signalled.
class PipeEnd {
  public:
    // `access` is PIPE_ACCESS_INBOUND or PIPE_ACCESS_OUTBOUND. Throws when the instance cannot be created.
    PipeEnd(const wchar_t* name, DWORD access, HANDLE stop);

    // Waits for a client.
    bool connect();
    bool write(std::string_view bytes, DWORD milliseconds);
    // Reads once, at most `limit` bytes. Returns false when the client has gone or nothing came in time.
    bool read(std::string& bytes, DWORD limit, DWORD milliseconds);
    void disconnect();

  private:
    bool finish(BOOL done, DWORD milliseconds, DWORD& count);

    tools::Handle pipe_;
    HANDLE stop_;
    tools::Handle event_;
    OVERLAPPED overlapped_{};
};

} // namespace service
