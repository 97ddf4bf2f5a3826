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

struct KeyCloser {
    using pointer = HKEY;
    void operator()(HKEY key) const noexcept
    {
        RegCloseKey(key);
    }
};
using RegistryKey = std::unique_ptr<HKEY, KeyCloser>;

// Returns a manual-reset event that is not signalled.
inline Handle createEvent()
{
    return Handle(CreateEventW(nullptr, TRUE, FALSE, nullptr));
}

} // namespace tools
