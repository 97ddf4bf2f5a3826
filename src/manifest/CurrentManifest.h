#pragma once

#include "manifest/Manifest.h"

// The manifest in force and the watcher, the thread that loads it.
namespace tavi {

// Builds the default exclusions, of which this layer knows nothing, on the watcher's thread: when it starts, with
// `isFirst` set, and then every 90 seconds.
using ExclusionBuilder = void (*)(bool isFirst);
// To be set before the watcher starts. Without a builder none are built.
void setExclusionBuilder(ExclusionBuilder builder) noexcept;

// Returns the manifest in force, or null before the first load; then it also starts the watcher. Never waits. Any
// thread.
ManifestRef getCurrentManifest() noexcept;

// Holds a reference to the manifest in force until the next call, for the next menu, or until the module is unmapped.
// For others (see ARCHITECTURE.md). Starts the watcher like getCurrentManifest. Any thread.
void holdManifestForMenu() noexcept;

// Asks the watcher to end, which it does within half a second. Does not wait.
void requestWatcherStop() noexcept;

// Withdraws the request, or starts the watcher again if it has ended.
void resumeWatcher() noexcept;

// Returns false before the watcher's first start and after its end.
bool isWatcherActive() noexcept;

// Asks the watcher to end, without waiting for it, and releases the manifest in force and the menu's. Process detach
// only.
void stopManifestWatcher() noexcept;

} // namespace tavi
