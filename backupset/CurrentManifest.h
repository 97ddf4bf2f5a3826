#pragma once

#include "backupset/Manifest.h"

// The manifest in force and the thread that keeps it so.
namespace tavi {

// The current manifest with one reference for the caller, or null while none has been loaded. The first call starts the
// watcher. Never waits; any thread.
const Manifest* GetCurrentManifest() noexcept;

// Builds the list of default exclusions on the watcher's thread: first at its start, then at every 18th round. Set
// before the first GetCurrentManifest; null builds nothing.
using ExclusionBuilder = void (*)(bool firstLoad);
void setExclusionBuilder(ExclusionBuilder builder) noexcept;

// Asks the watcher to end; it does so within half a second, in its own time.
void requestWatcherStop() noexcept;

// Detach only: asks the watcher to end and drops the current manifest. Does not wait for the thread.
void StopManifestWatcher() noexcept;

} // namespace tavi
