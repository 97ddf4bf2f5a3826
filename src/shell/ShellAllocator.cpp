#include "shell/ShellAllocator.h"

#include <atomic>

#include <shlobj.h>

namespace tavi {
namespace {

std::atomic<IMalloc*> theAllocator{nullptr};

} // namespace

IMalloc* shellAllocator() noexcept
{
    return theAllocator;
}

void acquireShellAllocator() noexcept
{
    IMalloc* allocator = nullptr;
    if (SUCCEEDED(SHGetMalloc(&allocator)))
        theAllocator = allocator;
}

void releaseShellAllocator() noexcept
{
    if (IMalloc* allocator = theAllocator.exchange(nullptr))
        allocator->Release();
}

} // namespace tavi
