#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace service {

// Runs one backup of a folder: stores new and changed files, records deleted ones, publishes the manifest. `time`, in
// seconds since 1970, replaces the present. Throws if a file cannot be read.
void backUp(const std::wstring& folder, std::optional<std::int64_t> time);

} // namespace service
