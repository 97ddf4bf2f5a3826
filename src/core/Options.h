#pragma once

#include <cstdint>
#include <optional>

// The two settings of the service that the module reads, uncached and without logging. A value that cannot be read is
// deleted from the settings key and counts as absent. Any thread.
namespace tavi {

// Returns when the service last changed the stored manifest, in milliseconds since 1970; nothing if the setting is
// absent or is no date and time.
std::optional<std::int64_t> readManifestTime();

// Returns whether the default exclusions leave out the machine's places only, and so keep the users' places; nothing if
// the setting is absent.
std::optional<bool> readGraylistEnabled();

} // namespace tavi
