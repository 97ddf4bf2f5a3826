#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "core/PublishedPointer.h"
#include "manifest/Manifest.h"

namespace tavi {

// The data that the watcher thread shares with the rest of the module. They outlive it.
struct WatcherState {
    PublishedPointer<const Manifest> manifest;
    // The rest is only for the watcher thread. The local time of the last load in milliseconds since 1970.
    std::int64_t lastLoad = 0;
    // Until a load has ended without an exception.
    bool isLoadDue = true;
};

// The system as the watcher sees it. All functions are called on the watcher's thread.
struct WatcherServices {
    // Returns null if the stored text is invalid.
    std::function<ManifestRef()> loadManifest;
    // Returns when the service last stored a manifest. This time and now() are milliseconds of local time since 1970.
    std::function<std::optional<std::int64_t>()> manifestTime;
    std::function<std::int64_t()> now;
    std::function<void(std::uint32_t milliseconds)> sleep;
    // Returns whether the watcher is to return.
    std::function<bool()> isStopping;
    std::function<void(bool isFirst)> buildExclusions;
};

// Loads the manifest, unless an earlier watcher has loaded the stored one, and polls for changes until
// WatcherServices::isStopping. A failure is logged and ends one poll only.
void runManifestWatcher(WatcherState& state, const WatcherServices& services);

// Returns the stored manifest; an empty one if there is none or the database fails, which is logged; null for an
// invalid text.
ManifestRef readStoredManifest();

} // namespace tavi
