#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "core/PublishedPointer.h"
#include "manifest/Manifest.h"

namespace tavi {

// What outlives a watcher thread, for the next one. Any thread may read the manifest; the other members belong to the
// watcher thread.
struct WatcherState {
    PublishedPointer<const Manifest> manifest;
    // The local time of the last load in milliseconds since 1970.
    std::int64_t lastLoad = 0;
    // True until a load has ended without an exception.
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
// invalid text. Throws std::bad_alloc, also if SQLite's memory does not suffice.
ManifestRef readStoredManifest();

} // namespace tavi
