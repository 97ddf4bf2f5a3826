#pragma once

#include <wx/string.h>

#include "exclusions/PathTree.h"

// The default exclusions: the places that a backup leaves out unless the user says otherwise. For others (see
// ARCHITECTURE.md): the module builds the list and never asks it. Any thread. A build is slow and blocks only other
// builders, and readers while there is no list.
namespace tavi {

// Returns the current list; builds it if there is none or if `refresh` is set. The caller releases one reference,
// except if another thread built the list while this call waited: then the caller has none.
const PathTree* getGraylist(bool refresh);
// Builds the list as getGraylist does, without returning it.
void buildGraylist(bool refresh);
// Returns the list of the user rules alone, built alike. The caller has no reference; the next refresh releases the
// list.
const PathTree* getUserDataTree(bool refresh);

// Returns whether the path is left out and so is something beneath it, or everything.
bool isGrayed(const wxString& path);
// Returns whether the path is left out, but not everything beneath it.
bool isPartlyGrayed(const wxString& path);
// Returns whether a user rule leaves the path out.
bool isUserData(const wxString& path);

// Releases the current list, after a build in progress. Process detach only.
void dropGraylist() noexcept;

} // namespace tavi
