#pragma once

#include <functional>

// The module's lines in the service's shared log file. Written with the library's log functions (wxLogError and so on)
// from any thread; each line is in the file, whole, when the call returns.
namespace tavi {

// Waits up to 30 seconds for the service's data directory, then appends to the log there and drops what is above
// `level`. False when the directory never became known: then nothing was set up. A file that cannot be opened still
// answers true.
bool openLog(unsigned long level);
// As above, for a caller that brings its own wait, in milliseconds.
bool openLog(unsigned long level, const std::function<void(unsigned long)>& sleep);

// Closes the file, so that nothing stays open when the module is unloaded. No thread may log afterwards.
void closeLog() noexcept;

// Switches the process's library logging off for as long as it lives. Overlapping ones on several threads end in the
// state that was there before the first.
class LogSilencer {
  public:
    LogSilencer();
    ~LogSilencer();
    LogSilencer(const LogSilencer&) = delete;
    LogSilencer& operator=(const LogSilencer&) = delete;
};

} // namespace tavi
