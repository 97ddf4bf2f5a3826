#pragma once

#include <cstdint>

namespace service {

// Restores what is requested and reports it, until the command stop or the end of the standard input, from which it
// takes commands. `bytesPerSecond` 0 is as fast as the disk; a restore searches for `searchMs` before its first file.
void run(std::int64_t bytesPerSecond, std::int64_t searchMs);

} // namespace service
