#pragma once

#include <cstdint>

#include "manifest/Manifest.h"
#include "core/PublishedPointer.h"

namespace tavi {

// The data that the watcher thread shares with the rest of the module.
struct WatcherState {
    PublishedPointer<const Manifest> manifest;
    // The local time of the last load in milliseconds since 1970. Only the watcher thread uses it.
    std::int64_t lastLoad = 0;
};

// The system as the watcher sees it. All methods are called on the watcher's thread.
class WatcherServices {
  public:
    virtual ~WatcherServices() = default;
    // Returns null if the stored text is invalid.
    virtual ManifestRef loadManifest() = 0;
    // Stores when the service last stored a manifest; returns false if that is not known. Both this time and now() are
    // milliseconds of local time since 1970.
    virtual bool manifestTime(std::int64_t& milliseconds) = 0;
    virtual std::int64_t now() = 0;
    virtual void sleep(std::uint32_t milliseconds) = 0;
    // Returns whether the watcher is to return.
    virtual bool isStopping() = 0;
    virtual void buildExclusions(bool firstLoad) = 0;
};

// Loads the manifest, unless an earlier watcher has loaded the stored one, and polls for changes until
// WatcherServices::isStopping. A failure is logged and ends one poll only.
void runManifestWatcher(WatcherState& state, WatcherServices& services);

// Returns the stored manifest; an empty one if there is none or the database fails, which is logged; null for an
// invalid text.
ManifestRef readStoredManifest();

} // namespace tavi
