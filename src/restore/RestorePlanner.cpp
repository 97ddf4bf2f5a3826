#include "restore/RestorePlanner.h"

#include <algorithm>
#include <optional>
#include <vector>

#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::uint32_t kLastFreeName = 9999;

// The newest version of that time decides; as a deletion it says that the file did not exist.
std::optional<std::uint32_t> versionAt(const ManifestPatchList& patches, std::uint32_t cutoff)
{
    for (std::size_t i = patches.size(); i-- > 0;) {
        const ManifestPatch patch = patches[i];
        if (patch.timestamp() <= cutoff) {
            if (patch.isDeletion())
                return std::nullopt;
            return static_cast<std::uint32_t>(i);
        }
    }
    return std::nullopt;
}

// Puts " (n)" before the extension. A name without one gets it at its end; one that begins with its
// last dot is all extension.
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
    const auto patch = versionAt(manifest_->patches(file), request.cutoffTime);
    if (!patch)
        return;
    std::uint32_t freeName = 0;
    if (!overwrite_) {
        const auto isTaken = [&] {
            buildTarget(manifestPath_, freeName, target_);
            return exists(target_);
        };
        manifestPath_.clear();
        manifest_->appendFilePathUtf8(file, manifestPath_);
        // With every number taken the one behind the last is used unasked.
        while (isTaken() && ++freeName <= kLastFreeName) {
        }
    }
    rows_.push({file, *patch, freeName});
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
        // A plain prefix, no separator added: required so, though a file's path then also takes longer names that begin
        // alike.
        manifest.forEachUnder(view(*path), [&](std::uint32_t file) {
            plan.plan(file, request, exists);
            return true;
        });
    }
    return plan;
}

} // namespace tavi
