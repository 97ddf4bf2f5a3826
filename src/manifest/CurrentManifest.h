#pragma once

#include "manifest/Manifest.h"

// The manifest in force and the watcher, the thread that loads it.
namespace tavi {

// Returns the manifest in force, or null before the first load; then it also starts the watcher. Never waits. Any
// thread.
ManifestRef getCurrentManifest() noexcept;

// Holds a reference to the manifest in force until the next call, for the next menu, or until the module is unmapped.
// Starts the watcher like getCurrentManifest. Any thread.
void holdManifestForMenu() noexcept;

// Asks the watcher to end, which it does within half a second. Does not wait.
void requestWatcherStop() noexcept;

// Withdraws the request, or starts the watcher again if it has ended.
void resumeWatcher() noexcept;

// Returns false before the watcher's first start and after its end.
bool isWatcherActive() noexcept;

// Asks the watcher to end, without waiting for it, and releases the manifest in force, the menu's and the list of
// default exclusions. Process detach only.
void stopManifestWatcher() noexcept;

} // namespace tavi
