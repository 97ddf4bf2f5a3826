#include "restore/RestorePlanner.h"

#include <algorithm>
#include <optional>
#include <vector>

#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::uint32_t kMaxFreeName = 9999;

// Inserts " (n)" before the extension: at the end of a name without a dot, at the front of one whose last dot comes
// first.
void insertFreeName(std::string& path, std::uint32_t number)
{
    const std::size_t slash = path.rfind('\\');
    const std::size_t nameStart = slash == std::string::npos ? 0 : slash + 1;
    std::size_t dot = path.rfind('.');
    if (dot == std::string::npos || dot < nameStart)
        dot = path.size();
    path.insert(dot, " (" + std::to_string(number) + ")");
}

} // namespace

RestorePlan::RestorePlan(const RestoreRequest& request, const Manifest& manifest)
    : manifest_(&manifest), overwrite_(request.overwrite)
{
    if (!request.sourcePrefix.empty() && !request.destinationFolder.empty()) {
        destination_ = toUtf8(view(request.destinationFolder));
        removedUnits_ = request.sourcePrefix.length();
    }
}

void RestorePlan::buildTarget(const std::string& manifestPath, std::uint32_t freeName, std::string& target) const
{
    target = destination_;
    target.append(manifestPath, utf8PrefixLength(manifestPath, removedUnits_), std::string::npos);
    if (freeName != 0)
        insertFreeName(target, freeName);
}

void RestorePlan::plan(std::uint32_t file, const RestoreRequest& request, const PathProbe& exists)
{
    const ManifestPatchList patches = manifest_->patches(file);
    const auto patch = patches.newestUpTo(request.cutoffTime);
    // A file without a version, or whose version is a deletion, did not exist then.
    if (!patch || patches[*patch].isDeletion())
        return;
    std::uint32_t freeName = 0;
    if (!overwrite_) {
        const auto isTaken = [&] {
            buildTarget(manifestPath_, freeName, target_);
            return exists(target_);
        };
        manifestPath_.clear();
        manifest_->appendFilePathUtf8(file, manifestPath_);
        // If all numbers are taken, the next one is used without a check, so that the file still gets its row.
        while (isTaken() && ++freeName <= kMaxFreeName) {
        }
    }
    rows_.push({file, static_cast<std::uint32_t>(*patch), freeName});
}

void RestorePlan::readEntry(std::uint32_t row, RestoreFileEntry& entry) const
{
    const Row& numbers = rows_[row];
    entry.manifestPath.clear();
    manifest_->appendFilePathUtf8(numbers.file, entry.manifestPath);
    buildTarget(entry.manifestPath, numbers.freeName, entry.targetPath);
    const ManifestPatch patch = manifest_->patches(numbers.file)[numbers.patch];
    entry.fileSize = patch.fileSize();
    entry.overwrite = overwrite_;
    entry.ctime = patch.ctime();
    entry.timestamp = patch.timestamp();
    entry.attributes = patch.attributes();
}

RestorePlan planRestore(const RestoreRequest& request, const Manifest& manifest, const PathProbe& exists)
{
    RestorePlan plan(request, manifest);
    std::vector<const wxString*> paths;
    paths.reserve(request.selectedPaths.size());
    for (const wxString& path : request.selectedPaths)
        paths.push_back(&path);
    std::sort(paths.begin(), paths.end(), [](const wxString* a, const wxString* b) { return *a < *b; });
    for (const wxString* path : paths) {
        // A plain prefix without a separator, as in the menu's question whether anything is backed up there. A file's
        // path therefore also selects longer names that begin alike; the service and its users rely on the same rows.
        manifest.forEachUnder(view(*path), [&](std::uint32_t file) {
            plan.plan(file, request, exists);
            return true;
        });
    }
    return plan;
}

} // namespace tavi
