#pragma once

#include <cstdint>

#include <windows.h>
#include <shlobj.h>
#include <wx/string.h>

#include "core/Paths.h"
#include "manifest/Manifest.h"

namespace tavi {

class FolderStateTable;

// How many of the selected items have a property.
enum class Coverage : std::int32_t { some = -1, none = 0, all = 1 };

// The items that the host selected, and what the menu and the dialogs need to know of them.
struct Selection {
    PathSet paths;
    // The items below which everything is backed up. For others (see ARCHITECTURE.md).
    Coverage stateSummary = Coverage::none;
    // The items with versions in the manifest.
    Coverage restoreMode = Coverage::none;
    // Whether a folder is among the items.
    bool hasFolder = false;
    // The name of a single item; empty for several items and for a drive.
    wxString displayName;
};

// Replaces the selection by the open folder and the data object's items, either of which may be null. Leaves out items
// that cannot be read.
void captureSelection(LPCITEMIDLIST folder, IDataObject* data, FolderStateTable& states, Selection& selection);

// The steps of the capture, for tests and tools.
using DriveTypeQuery = UINT(WINAPI*)(LPCWSTR root);
PathSet collectPaths(LPCITEMIDLIST folder, IDataObject* data, DriveTypeQuery driveType);
Coverage summarizeStates(const PathSet& paths, FolderStateTable& states);
// Sets restoreMode, hasFolder and displayName from the paths. The manifest may be null.
void summarizeVersions(Selection& selection, const Manifest* manifest);

} // namespace tavi
