#include "restore/RestorePlanner.h"

#include <algorithm>
#include <optional>
#include <vector>

#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::uint32_t kMaxFreeName = 9999;

// Inserts " (n)" before the last dot of the name, even if the name begins with that dot, or at the end of a name
// without one.
void insertFreeName(std::string& path, std::uint32_t number)
{
    const std::size_t slash = path.rfind('\\');
    const std::size_t nameStart = slash == std::string::npos ? 0 : slash + 1;
    std::size_t dot = path.rfind('.');
    if (dot == std::string::npos || dot < nameStart)
        dot = path.size();
    path.insert(dot, " (" + std::to_string(number) + ")");
}

// Names that differ in letter case only are one file. Letters beyond ASCII stay as they are: each file system has a
// table of its own for them.
void foldAsciiCase(std::string& target)
{
    for (char& c : target)
        c = c >= 'A' && c <= 'Z' ? static_cast<char>(c | 0x20) : c;
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

void RestorePlan::buildTarget(const std::string& manifestPath, std::uint32_t nameNumber, std::string& target) const
{
    target = destination_;
    target.append(manifestPath, utf8PrefixLength(manifestPath, removedUnits_), std::string::npos);
    if (nameNumber != 0)
        insertFreeName(target, nameNumber);
}

void RestorePlan::plan(std::uint32_t file, const RestoreRequest& request, const PathProbe& exists)
{
    const ManifestPatchList patches = manifest_->patches(file);
    const auto patch = patches.newestUpTo(request.cutoffTime);
    // A file without a version, or whose version is a deletion, did not exist then.
    if (!patch || patches[*patch].isDeletion())
        return;
    Row row{file, static_cast<std::uint32_t>(*patch), 0, 0};
    if (overwrite_) {
        rows_.push(row);
        return;
    }
    manifestPath_.clear();
    manifest_->appendFilePathUtf8(file, manifestPath_);
    for (;; ++row.nameNumber) {
        buildTarget(manifestPath_, row.nameNumber, target_);
        key_ = target_;
        foldAsciiCase(key_);
        row.hash = storage::hashBytes(0, key_);
        // If all numbers are taken, the next one is used without a check, so that the file still gets its row.
        if (row.nameNumber > kMaxFreeName || !isTaken(row, exists))
            break;
    }
    rows_.push(row);
    rowsByTarget_.push([this](std::uint32_t number) { return rows_[number].hash; });
}

// Returns whether an earlier row has the target of this one or the disk has it.
bool RestorePlan::isTaken(const Row& row, const PathProbe& exists)
{
    const std::uint32_t equal = rowsByTarget_.find(row.hash, [&](std::uint32_t number) {
        const Row& earlier = rows_[number];
        if (earlier.hash != row.hash)
            return false;
        std::string path, key;
        manifest_->appendFilePathUtf8(earlier.file, path);
        buildTarget(path, earlier.nameNumber, key);
        foldAsciiCase(key);
        return key == key_;
    });
    return equal != storage::HashIndex::kNone || exists(target_);
}

void RestorePlan::readEntry(std::uint32_t row, RestoreFileEntry& entry) const
{
    const Row& numbers = rows_[row];
    entry.manifestPath.clear();
    manifest_->appendFilePathUtf8(numbers.file, entry.manifestPath);
    buildTarget(entry.manifestPath, numbers.nameNumber, entry.targetPath);
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
        // A plain prefix: C:\a.txt also selects C:\a.txt.bak, and the folder C:\a the folder C:\ab. The menu asks for a
        // folder with its separator; here the service and its users rely on these rows.
        manifest.forEachUnder(view(*path), [&](std::uint32_t file) {
            plan.plan(file, request, exists);
            return true;
        });
    }
    return plan;
}

} // namespace tavi
