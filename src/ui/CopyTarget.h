#pragma once

#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "core/Paths.h"

// Where "Copy To" puts the restored files. The two ask functions run a message loop on the calling thread.
namespace tavi {

// Returns the longest leading part, in whole components, that all paths share, ignoring letter case; for a single path
// the path itself.
wxString commonPrefix(const PathSet& paths);

// Returns whether a file or folder exists at one of the targets: the folder and the path without the prefix.
bool anyTargetExists(const PathSet& paths, const wxString& prefix, const wxString& folder);

// Returns nothing when the user cancels.
std::optional<wxString> askFileName(HWND owner, const wxString& preset);

// Returns the chosen folder with a backslash at its end, or nothing when the user cancels.
std::optional<wxString> askFolder(HWND owner);

} // namespace tavi
