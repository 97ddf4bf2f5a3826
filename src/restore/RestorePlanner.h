#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include <wx/string.h>

#include "core/BlockArray.h"
#include "core/Paths.h"
#include "manifest/Manifest.h"

namespace tavi {

// The user's choices in the versions dialog.
struct RestoreRequest {
    PathSet selectedPaths;
    // Seconds since 1970 UTC: each file is restored as it was then.
    std::uint32_t cutoffTime = 0;
    // Removed from the front of the paths that are restored into the destination folder. Without both texts the restore
    // is in place.
    wxString sourcePrefix;
    wxString destinationFolder;
    bool overwrite = false;
    // Empty for this machine's own backup and the service's own key.
    wxString machineId;
    wxString machineAlias;
    wxString encryptionKey;
};

// One version to restore; the paths in UTF-8, as the database takes them.
struct RestoreFileEntry {
    std::string manifestPath;
    std::string targetPath;
    std::int64_t fileSize = 0;
    bool overwrite = false;
    std::uint32_t ctime = 0;
    std::uint32_t timestamp = 0;
    std::uint32_t attributes = 0;
};

// Returns whether something exists at a path, given in UTF-8.
using PathProbe = std::function<bool(const std::string& path)>;

// The files of one request, in the order of their rows. Stores numbers only, so that a million of them fit beside the
// manifest, which must outlive the plan.
class RestorePlan {
  public:
    std::uint32_t size() const noexcept
    {
        return rows_.size();
    }
    // Fills `entry`. Reusing one entry for all rows saves allocations.
    void readEntry(std::uint32_t row, RestoreFileEntry& entry) const;

  private:
    friend RestorePlan planRestore(const RestoreRequest& request, const Manifest& manifest, const PathProbe& exists);

    struct Row {
        std::uint32_t file;
        std::uint32_t patch;
        // The number in the target's name, 0 for none.
        std::uint32_t nameNumber;
        // Of the target's key. Unused if files may be overwritten.
        std::uint32_t hash;
    };

    RestorePlan(const RestoreRequest& request, const Manifest& manifest);
    void plan(std::uint32_t file, const RestoreRequest& request, const PathProbe& exists);
    bool isTaken(const Row& row, const PathProbe& exists);
    void buildTarget(const std::string& manifestPath, std::uint32_t nameNumber, std::string& target) const;

    const Manifest* manifest_;
    std::string destination_;
    std::size_t removedUnits_ = 0;
    bool overwrite_;
    BlockArray<Row, 15> rows_;
    storage::HashIndex rowsByTarget_;
    std::string manifestPath_;
    std::string target_;
    std::string key_;
};

// Chooses the version and the target of every file of the manifest whose path begins with a selected path. If existing
// files are to be kept, `exists` accepts no target and no two are equal, unless all numbers of a name are taken; else
// it is not called.
RestorePlan planRestore(const RestoreRequest& request, const Manifest& manifest, const PathProbe& exists);

} // namespace tavi
