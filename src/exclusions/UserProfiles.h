#pragma once

#include <vector>

#include <wx/string.h>

// The registry hives of all users of the machine, for as long as the list of default exclusions is built. Callers
// serialise loadUserHives, shellFolderPaths and unloadUserHives among themselves.
namespace tavi {

// Makes every profile's hive reachable below HKEY_USERS, those of users who are not logged on under temporary names.
// Nests: only the outermost pair works. What cannot be loaded is left out in silence; without the backup and restore
// privileges that is every hive that the system has not loaded itself. Throws std::bad_alloc, with every hive unloaded
// and the nesting as before.
void loadUserHives();
void unloadUserHives() noexcept;

// The named value of every user's "Shell Folders" key, in long form and in the order of the hives; without those that
// do not exist. A user whose hive can be reached twice contributes twice.
std::vector<wxString> shellFolderPaths(const wxString& valueName);

} // namespace tavi
