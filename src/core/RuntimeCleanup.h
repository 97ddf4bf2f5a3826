#pragma once

namespace tavi {

// Releases what the static C++ runtime keeps for the calling thread: its handles would outlive the module if another
// thread unloads it. The runtime creates them again on demand. Does nothing while an exception is in flight or being
// handled on the thread.
void releaseThreadRuntime() noexcept;

} // namespace tavi
