#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "Installation.h"

namespace service {

// One run over these folders: stores what is new or changed, records what has vanished, publishes the manifest. `time`
// stands for the present when given. False when some file could not be read; it keeps the versions it has.
bool backUp(const Installation& installation, const std::vector<std::wstring>& folders,
            std::optional<std::int64_t> time);

} // namespace service
