#pragma once

#include <functional>
#include <optional>
#include <set>
#include <vector>

#include <wx/string.h>

#include "exclusions/PathTree.h"

// Which places a backup leaves out by default, and what inside them is user data after all. Pure: where the places are
// is asked of the sources, each of which may have no answer.
namespace tavi {

class ExclusionSources {
  public:
    virtual ~ExclusionSources() = default;
    // Ending in a backslash.
    virtual std::set<wxString> mountPoints() = 0;
    virtual std::optional<wxString> registryText(const wxString& key, const wxString& value) = 0;
    virtual std::vector<wxString> registryTexts(const wxString& key, const wxString& value) = 0;
    // By the shell's number of the folder.
    virtual std::optional<wxString> specialFolder(int number) = 0;
    virtual std::optional<wxString> temporaryFolder() = 0;
    // Without a backslash at its end, unless it is a root.
    virtual wxString windowsFolder() = 0;
    // Names of the entries that begin with a dollar sign, in the order of the listing.
    virtual std::vector<wxString> dollarEntries(const wxString& folder) = 0;
    virtual wxString serviceDataFolder() = 0;
    // A named shell folder of every user.
    virtual std::vector<wxString> userFolders(const wxString& name) = 0;
    virtual bool exists(const wxString& folder) = 0;
    // The setting that takes the users' places out of the list.
    virtual bool keepsUserPlaces() = 0;
};

constexpr FolderState kGrayed = FolderState::allOn;
constexpr FolderState kCarvedOut = FolderState::off;

using RuleSink = std::function<void(const wxString& path, FolderState state)>;

// The order is part of the result: a later rule replaces those below it.
void addMachineRules(ExclusionSources& sources, const RuleSink& add);
void addUserRules(ExclusionSources& sources, const RuleSink& add);

} // namespace tavi
