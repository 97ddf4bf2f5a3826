#pragma once

// A store for the module's thread-local variables, which belong to the static C++ runtime: above all the exceptions in
// flight. The compiler's own store (libgcc's emutls.c) never frees its locks, so each unload of the module would leave
// two semaphores and a dozen heap blocks in the host. This store frees everything.
namespace tavi {

// Frees the variables of every thread. No other thread may run code of the module any more.
void releaseAllThreadLocals() noexcept;

} // namespace tavi
