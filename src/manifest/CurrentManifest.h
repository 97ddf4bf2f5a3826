#pragma once

#include "manifest/Manifest.h"

// The manifest in force and the thread that keeps it so.
namespace tavi {

// Returns the current manifest, or null while none has been loaded. The first call starts the watcher. Never waits; any
// thread.
ManifestRef getCurrentManifest() noexcept;

// Starts the watcher like getCurrentManifest. The manifest in force stays referenced until the next menu asks or the
// module is unmapped, whatever is loaded meanwhile. Any thread.
void holdManifestForMenu() noexcept;

// Asks the watcher to end. It does so within half a second, and nobody waits for it.
void requestWatcherStop() noexcept;

// Withdraws the request, or starts the watcher again if it has ended.
void resumeWatcher() noexcept;

// False before the watcher has been started and once it has ended.
bool isWatcherActive() noexcept;

// Detach only: asks the watcher to end and releases the current manifest, the menu's and the list of default
// exclusions. Does not wait for the thread.
void stopManifestWatcher() noexcept;

} // namespace tavi
