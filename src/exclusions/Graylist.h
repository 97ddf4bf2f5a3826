#pragma once

#include <wx/string.h>

#include "exclusions/PathTree.h"

// The places that a backup leaves out by default. Any thread; building takes its time and makes only other builders and
// first readers wait.
namespace tavi {

// The current list with one reference for the caller, built if there is none or `refresh` asks for a new one. Only when
// another thread has built it while this call waited, the caller gets it without a reference of its own.
const PathTree* getGraylist(bool refresh);
// The same for its effect alone.
void buildGraylist(bool refresh);
// The list of the users' places alone. Readers never release it: without `refresh` it is theirs as it is.
const PathTree* getUserDataTree(bool refresh);

// Left out, as a whole or with exceptions beneath it.
bool isGrayed(const wxString& path);
// Left out with exceptions beneath it.
bool isPartlyGrayed(const wxString& path);
// Of the users' places.
bool isUserData(const wxString& path);

// Detach only.
void dropGraylist() noexcept;

} // namespace tavi
