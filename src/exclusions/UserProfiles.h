#pragma once

#include <vector>

#include <wx/string.h>

// The registry hives of all users of the machine during a build of the default exclusions. Callers serialize the
// first three functions.
namespace tavi {

// Loads the hives of users who are not logged on below HKEY_USERS, under temporary names. Calls nest: only the
// outermost pair has an effect. Hives that cannot be loaded are skipped silently; without the backup and restore
// privileges those are all. Throws std::bad_alloc, with every hive unloaded and the nesting as before.
void loadUserHives();
void unloadUserHives() noexcept;

// Returns the value of this name of every user's "Shell Folders" key, in the order of the hives, as long paths; those
// that do not exist are left out. A user whose hive is reachable twice contributes twice.
std::vector<wxString> shellFolderPaths(const wxString& valueName);

// Returns the long form of an existing path, with an upper-case drive letter; empty if it does not exist. Any thread.
wxString longPath(const wxString& path);

} // namespace tavi
