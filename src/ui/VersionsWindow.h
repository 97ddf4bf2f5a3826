#pragma once

#include <windows.h>

#include "manifest/Manifest.h"
#include "ui/Selection.h"

namespace tavi {

// Opens the "Restore Files" window for the selection, with a thread of its own, on the monitor of the host's window
// (which may be null). Any thread; any number of windows. Returns false and logs an error if the thread cannot start.
bool openVersionsWindow(Selection selection, ManifestRef manifest, HWND host);

} // namespace tavi
