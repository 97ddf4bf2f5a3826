#pragma once

// The thread-local variables of the module, which are those of the static C++ runtime: above all the exceptions in
// flight. The compiler's own store for them never frees its locks, two semaphores and a dozen heap blocks: each unload
// of the module would leave them in the host. This store frees everything.
namespace tavi {

// Frees the variables of every thread. Only when no other thread can run code of the module any more.
void releaseAllThreadLocals() noexcept;

} // namespace tavi
