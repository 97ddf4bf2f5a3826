#pragma once

#include <functional>
#include <optional>
#include <set>
#include <vector>

#include <wx/string.h>

#include "exclusions/PathTree.h"

// The rules of the default exclusions: the places that a backup leaves out, and the user data inside them that it
// keeps. Pure: the sources answer where the places are, or that there is none.
namespace tavi {

// Folders that the shell knows. The values are CSIDL numbers.
enum class SpecialFolder {
    recycleBin = 10,
    windows = 36,
    system = 37,
    programFiles = 38,
    programFiles32 = 42,
    commonFiles = 43,
    commonFiles32 = 44,
    commonAdminTools = 47
};

struct ExclusionSources {
    // Each ends in a backslash.
    std::function<std::set<wxString>()> mountPoints;
    // A value below HKEY_LOCAL_MACHINE.
    std::function<std::optional<wxString>(const wxString& key, const wxString& value)> registryText;
    std::function<std::vector<wxString>(const wxString& key, const wxString& value)> registryTexts;
    std::function<std::optional<wxString>(SpecialFolder folder)> specialFolder;
    std::function<std::optional<wxString>()> temporaryFolder;
    // Without a backslash at its end, unless it is a root.
    std::function<wxString()> windowsFolder;
    // Names of the entries that begin with a dollar sign, in the order of the listing.
    std::function<std::vector<wxString>(const wxString& folder)> dollarEntries;
    std::function<wxString()> serviceDataFolder;
    // The value `name` of every user's "Shell Folders" key.
    std::function<std::vector<wxString>(const wxString& name)> userFolders;
    std::function<bool(const wxString& folder)> exists;
    // The setting options.graylist, which leaves the user rules out.
    std::function<bool()> keepsUserPlaces;
};

constexpr FolderState kGrayed = FolderState::allOn;
constexpr FolderState kCarvedOut = FolderState::off;

using RuleSink = std::function<void(const wxString& path, FolderState state)>;

// Each passes its rules to `add`. Their order matters: a rule replaces earlier ones below its path.
void addMachineRules(const ExclusionSources& sources, const RuleSink& add);
void addUserRules(const ExclusionSources& sources, const RuleSink& add);

} // namespace tavi
