#pragma once

#include <cstdint>
#include <unordered_map>
#include <vector>

#include <wx/string.h>

#include "core/Paths.h"
#include "core/RefCounted.h"
#include "exclusions/PathTree.h"

namespace tavi {

// Caches the folder listings of one build of an exclusion list. One thread.
class FolderListings {
  public:
    struct Folder {
        // The constructor says which entries count.
        std::uint32_t entries = 0;
        std::uint32_t folders = 0;
        // Names that begin with a dollar sign, in the order of the listing.
        std::vector<wxString> dollarEntries;
    };

    // Returns the list in force, or null. Called for each listing, since another list may be published during a build.
    using CurrentTree = RefPtr<const PathTree> (*)();

    // Entries that `excluded` leaves out with everything beneath do not count, except in folders that are on in
    // `userData`.
    FolderListings(CurrentTree excluded, CurrentTree userData) noexcept : excluded_(excluded), userData_(userData) {}

    // Returns an empty listing if the folder cannot be listed. The reference is valid as long as this object.
    const Folder& find(const wxString& path);

  private:
    void list(const wxString& path, Folder& folder) const;

    const CurrentTree excluded_;
    const CurrentTree userData_;
    std::unordered_map<wxString, Folder, PathHash> folders_;
};

} // namespace tavi
