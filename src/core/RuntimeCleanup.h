#pragma once

namespace tavi {

// Releases what the static C++ runtime keeps for the calling thread: handles that would outlive the module when another
// thread unloads it. The runtime creates again what the thread needs later. Does nothing while an exception is in
// flight or being handled on the thread.
void releaseThreadRuntime() noexcept;

} // namespace tavi
