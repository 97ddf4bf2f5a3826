#pragma once

#include <cstdint>

#include "manifest/Manifest.h"
#include "core/PublishedPointer.h"

namespace tavi {

// What the watcher thread shares with the rest of the module.
struct WatcherState {
    PublishedPointer<const Manifest> manifest;
    // The local time of the last load in milliseconds since 1970. Only the watcher thread uses it.
    std::int64_t lastLoad = 0;
};

// What the watcher needs of the outside; each is called on the watcher's thread.
class WatcherServices {
  public:
    virtual ~WatcherServices() = default;
    // Returns null for a stored text that is no manifest.
    virtual ManifestRef loadManifest() = 0;
    // The service's time of the stored manifest and the clock it is compared with: milliseconds since 1970, or false.
    virtual bool manifestTime(std::int64_t& milliseconds) = 0;
    virtual std::int64_t now() = 0;
    virtual void sleep(std::uint32_t milliseconds) = 0;
    // True when the watcher is to return.
    virtual bool isStopping() = 0;
    virtual void buildExclusions(bool firstLoad) = 0;
};

// Loads the manifest unless the one in force is still fresh, and keeps it current until the services say stop. A
// failure in one round is logged and the next round continues.
void runManifestWatcher(WatcherState& state, WatcherServices& services);

// The stored manifest, parsed: an empty one when there is none or the database fails, which is logged; null for an
// invalid text.
ManifestRef readStoredManifest();

} // namespace tavi
