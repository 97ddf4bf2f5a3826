#pragma once

#include <windows.h>

namespace tavi {

using ThreadBody = void (*)(void* argument);

// Starts a thread that keeps the module mapped until it has left the module's code. An exception of the body is logged.
// Returns the thread's handle, which the caller owns, or null if the thread could not start: the body then never gets
// the argument. With `suspended` the caller resumes the thread.
HANDLE startModuleThread(ThreadBody body, void* argument, bool suspended = false) noexcept;

} // namespace tavi
