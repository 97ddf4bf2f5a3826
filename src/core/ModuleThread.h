#pragma once

#include <windows.h>

namespace tavi {

using ThreadBody = void (*)(void* argument);

// Starts a thread that keeps the module mapped until it has left the module's code. An exception of the body is logged.
// Returns the thread's handle, owned by the caller, or null if the thread could not start: then the argument stays the
// caller's. With `suspended` the caller resumes the thread, for instance after storing the handle.
HANDLE startModuleThread(ThreadBody body, void* argument, bool suspended = false) noexcept;

} // namespace tavi
