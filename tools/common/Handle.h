#pragma once

#include <memory>

#include <windows.h>

namespace tools {

struct HandleCloser {
    using pointer = HANDLE;
    void operator()(HANDLE handle) const noexcept
    {
        CloseHandle(handle);
    }
};
using Handle = std::unique_ptr<HANDLE, HandleCloser>;

// Returns a manual-reset event that is not signalled.
inline Handle createEvent()
{
    return Handle(CreateEventW(nullptr, TRUE, FALSE, nullptr));
}

} // namespace tools
