#pragma once

#include <cstdint>
#include <optional>

// The two settings of the service that the module reads. Nothing is cached and nothing is logged; a value that cannot
// be read is deleted from the settings key and counts as absent. Any thread.
namespace tavi {

// When the service last changed the stored manifest: milliseconds since 1970 of that local date and time. Nothing when
// the setting is absent or no date and time.
std::optional<std::int64_t> readManifestTime();

// Whether the default exclusions are in force; nothing when the setting is absent.
std::optional<bool> readGraylistEnabled();

} // namespace tavi
