#pragma once

#include <functional>

// The log file that the module shares with the service. Any thread writes lines to it (core/LogLine.h); the whole line
// is in the file when the call returns.
namespace tavi {

// Waits up to 30 seconds for the service's data directory, then opens the log there; lines above `level` are dropped.
// Returns false, with nothing set up, if the directory did not become known; true even if the file cannot be opened.
bool openLog(unsigned long level);
// The same with the caller's function for the wait, in milliseconds.
bool openLog(unsigned long level, const std::function<void(unsigned long)>& sleep);

// Closes the file before the module is unloaded. No thread may log afterwards.
void closeLog() noexcept;

} // namespace tavi
