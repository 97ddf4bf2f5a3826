#pragma once

#include <string>

#include <windows.h>

#include "core/Handles.h"
#include "tests/support/Dialogs.h"

namespace tavi::test {

constexpr const wchar_t* kStatus = L"\\\\.\\pipe\\tavistatus";
constexpr const wchar_t* kCommand = L"\\\\.\\pipe\\tavibackup";

// One instance of the service's end of a pipe.
class PipeServer {
  public:
    // With a buffer of 0 bytes a client's write returns only once it is read.
    PipeServer(const wchar_t* name, DWORD access, DWORD instances = 1, DWORD buffer = 65536)
        : pipe_(CreateNamedPipeW(name, access, PIPE_TYPE_BYTE | PIPE_NOWAIT, instances, buffer, buffer, 0, nullptr))
    {
        EXPECT_TRUE(pipe_);
    }
    bool waitClient() const
    {
        return waitUntil(
            [&] { return !ConnectNamedPipe(pipe_.get(), nullptr) && GetLastError() == ERROR_PIPE_CONNECTED; });
    }
    // Returns once the client has read the bytes.
    void write(const std::string& bytes) const
    {
        DWORD written = 0;
        EXPECT_TRUE(WriteFile(pipe_.get(), bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr) &&
                    FlushFileBuffers(pipe_.get()));
    }
    void hangUp() const
    {
        DisconnectNamedPipe(pipe_.get());
    }

  private:
    FileHandle pipe_;
};

} // namespace tavi::test
