#pragma once

#include "exclusions/ExclusionRules.h"
#include "exclusions/FolderListings.h"

namespace tavi {

// The places of the exclusion rules on this machine. One thread; the users' folders are those whose hives are loaded
// (see UserProfiles.h).
class SystemSources final : public ExclusionSources {
  public:
    // The listings must outlive this object.
    explicit SystemSources(FolderListings& listings) : listings_(listings) {}

    std::set<wxString> mountPoints() override;
    std::optional<wxString> registryText(const wxString& key, const wxString& value) override;
    std::vector<wxString> registryTexts(const wxString& key, const wxString& value) override;
    std::optional<wxString> specialFolder(int number) override;
    std::optional<wxString> temporaryFolder() override;
    wxString windowsFolder() override;
    std::vector<wxString> dollarEntries(const wxString& folder) override;
    wxString serviceDataFolder() override;
    std::vector<wxString> userFolders(const wxString& name) override;
    bool exists(const wxString& folder) override;
    bool keepsUserPlaces() override;

  private:
    FolderListings& listings_;
};

} // namespace tavi
