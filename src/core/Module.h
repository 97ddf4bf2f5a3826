#pragma once

#include <atomic>
#include <cstdint>

#include <windows.h>
#include <objidl.h>

namespace tavi {

// The module's own instance, set at attach before any other use and never changed. Resources and the module path come
// from it.
HINSTANCE moduleInstance() noexcept;
void setModuleInstance(HINSTANCE instance) noexcept;

// The shell's allocator, held from attach to detach in the file manager; null elsewhere. Not owned by the caller.
IMalloc* shellAllocator() noexcept;
void acquireShellAllocator() noexcept;
void releaseShellAllocator() noexcept;

// Live COM objects, class factories and windows. The host may unload the module while it is 0.
std::atomic<std::int32_t>& moduleRefCount() noexcept;

// Counts as one object of the module for as long as it lives. Any thread.
class ModuleLock {
  public:
    ModuleLock() noexcept
    {
        ++moduleRefCount();
    }
    ~ModuleLock()
    {
        --moduleRefCount();
    }
    ModuleLock(const ModuleLock&) = delete;
    ModuleLock& operator=(const ModuleLock&) = delete;
};

// Releases what the static runtime keeps for the calling thread: handles that would outlive the module when another
// thread unloads it. The runtime creates again what the thread needs later. Does nothing while an exception is in
// flight or being handled on the thread.
void releaseThreadRuntime() noexcept;

using ThreadBody = void (*)(void* argument);

// Starts a thread that keeps the module mapped until it has left the module's code; whatever the body throws is logged.
// Returns the thread's handle, owned by the caller, or null when it could not start: then the argument stays the
// caller's. `suspended` leaves it to the caller to resume the thread once the handle is stored.
HANDLE startModuleThread(ThreadBody body, void* argument, bool suspended = false) noexcept;

} // namespace tavi
