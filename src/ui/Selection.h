#pragma once

#include <cstdint>

#include <windows.h>
#include <shlobj.h>

#include <wx/string.h>

#include "manifest/Manifest.h"
#include "core/Paths.h"

namespace tavi {

class FolderStateTable;

// What the shell handed over, condensed. A plain value of the object that captured it.
struct Selection {
    PathSet paths;
    // How many of the items have the wanted property: 0 none, 1 all, -1 some.
    std::int32_t stateSummary = 0;
    std::int32_t restoreMode = 0;
    bool isFolder = false;
    // Of a single item; empty for several and for a drive.
    wxString displayName;
};

// Replaces the selection by the open folder and the data object's items, either of which may be null. What cannot be
// read is left out.
void captureSelection(LPCITEMIDLIST folder, IDataObject* data, FolderStateTable& states, Selection& selection);

// The steps of the capture, for callers that bring their own surroundings.
using DriveTypeQuery = UINT(WINAPI*)(LPCWSTR root);
PathSet collectPaths(LPCITEMIDLIST folder, IDataObject* data, DriveTypeQuery driveType);
std::int32_t summarizeStates(const PathSet& paths, FolderStateTable& states);
// Sets restoreMode, isFolder and displayName from the paths; the manifest may be null.
void summarizeVersions(Selection& selection, const Manifest* manifest);

} // namespace tavi
