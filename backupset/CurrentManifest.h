#pragma once

#include "backupset/Manifest.h"

// The manifest in force and the thread that keeps it so.
namespace tavi {

// The current manifest with one reference for the caller, or null while none has been loaded. The first call starts the
// watcher. Never waits; any thread.
const Manifest* GetCurrentManifest() noexcept;

// Asks the watcher to end; it does so within half a second, in its own time.
void requestWatcherStop() noexcept;

// Takes the request back; starts the watcher again if it has ended.
void resumeWatcher() noexcept;

// Detach only: asks the watcher to end, drops the current manifest and the list of default exclusions. Does not wait
// for the thread.
void StopManifestWatcher() noexcept;

} // namespace tavi
