#pragma once

#include <windows.h>
#include <objidl.h>

namespace tavi {

// The shell's allocator, held from attach to detach in the file manager; null elsewhere. Not owned by the caller.
IMalloc* shellAllocator() noexcept;
void acquireShellAllocator() noexcept;
void releaseShellAllocator() noexcept;

} // namespace tavi
