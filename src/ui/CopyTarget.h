#pragma once

#include <optional>

#include <windows.h>
#include <wx/string.h>

#include "core/Paths.h"

// Where "Copy To" puts the restored files. The two questions run their own message loops on the calling thread.
namespace tavi {

// The longest leading part, in whole components, that all paths share; letter case does not count. A single path is its
// own.
wxString commonPrefix(const PathSet& paths);

// Whether anything exists where one of the paths, less the prefix, would land behind the folder.
bool anyTargetExists(const PathSet& paths, const wxString& prefix, const wxString& folder);

// Nothing when the user cancels.
std::optional<wxString> askFileName(HWND owner, const wxString& preset);

// The chosen folder with a backslash at its end; nothing when the user cancels.
std::optional<wxString> askFolder(HWND owner);

} // namespace tavi
