#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include <wx/string.h>

#include "core/RefCounted.h"
#include "manifest/ManifestStorage.h"

// The parsed backup set. A manifest is immutable: any thread that holds a reference reads it without a lock.
namespace tavi {

class Manifest;
using ManifestRef = RefPtr<const Manifest>;

// Stands for any time in a manifest's queries.
constexpr std::uint32_t kAnyTime = 0xFFFFFFFF;
// The file size that marks a deletion.
constexpr std::int64_t kDeletedSize = -1;

// One version of one file; valid while its manifest is held.
class ManifestPatch {
  public:
    std::uint32_t timestamp() const noexcept
    {
        return version_->timestamp;
    }
    std::uint32_t modifiedTime() const noexcept
    {
        return version_->modifiedTime;
    }
    std::uint32_t ctime() const noexcept
    {
        return version_->ctime;
    }
    std::uint32_t attributes() const noexcept
    {
        return version_->attributes;
    }
    std::int64_t fileSize() const noexcept
    {
        return static_cast<std::int64_t>(std::uint64_t{version_->sizeHigh} << 32 | version_->sizeLow);
    }
    bool isDeletion() const noexcept
    {
        return fileSize() == kDeletedSize;
    }
    std::int64_t aux1() const noexcept;
    std::int64_t aux2() const noexcept;
    wxString auxText() const;

  private:
    friend class ManifestPatchList;
    ManifestPatch(const storage::PackedVersion& version, std::string_view extra) noexcept
        : version_(&version), extra_(extra)
    {
    }

    const storage::PackedVersion* version_;
    std::string_view extra_;
};

// The versions of one file, oldest first; valid while its manifest is held.
class ManifestPatchList {
  public:
    std::size_t size() const noexcept
    {
        return count_;
    }
    bool empty() const noexcept
    {
        return count_ == 0;
    }
    ManifestPatch operator[](std::size_t i) const noexcept;

    // Returns the index of the newest version with a timestamp of at most `time`; 0 is a time like any other.
    std::optional<std::size_t> newestUpTo(std::uint32_t time) const noexcept;
    // Returns whether the file existed at `time`; 0 asks for the newest version.
    bool existsAt(std::uint32_t time) const noexcept;

  private:
    friend class Manifest;
    ManifestPatchList(const Manifest& manifest, std::uint32_t first, std::uint32_t count) noexcept
        : manifest_(&manifest), first_(first), count_(count)
    {
    }

    const Manifest* manifest_;
    std::uint32_t first_;
    std::uint32_t count_;
};

class Manifest : public RefCounted<Manifest> {
  public:
    // Returns null for a text with an invalid line, which is logged.
    static ManifestRef parse(const wxString& text);

    // Returns whether the file existed at `time`; 0 asks for the newest version, kAnyTime for any.
    bool isBackedUp(std::wstring_view path, std::uint32_t time) const;
    // Returns the same for any file whose path begins with exactly these characters; no separator is added.
    bool hasBackedUpUnder(std::wstring_view prefix, std::uint32_t time) const;
    std::optional<ManifestPatchList> findPatches(std::wstring_view path) const;

    // Files are numbered from 0, by folder and then by name.
    std::uint32_t fileCount() const noexcept
    {
        return files_.size();
    }
    wxString filePath(std::uint32_t file) const;
    void appendFilePathUtf8(std::uint32_t file, std::string& out) const;
    ManifestPatchList patches(std::uint32_t file) const noexcept
    {
        return {*this, files_[file].firstVersion, files_[file].versionCount};
    }

    // Calls visit(file) for each file whose path begins with `prefix`, in order, until it returns false.
    template <class Visit>
    void forEachUnder(std::wstring_view prefix, Visit visit) const
    {
        for (const FileRange& range : filesUnder(prefix).ranges) {
            for (std::uint32_t file = range.first; file < range.second; ++file) {
                if (!visit(file))
                    return;
            }
        }
    }

    const wxString& userText() const noexcept
    {
        return userText_;
    }
    const wxString& hash() const noexcept
    {
        return hash_;
    }
    // Returns the number of UTF-16 units of the whole text, plus one.
    std::uint32_t textLength() const noexcept
    {
        return textLength_;
    }
    // Returns the memory that the manifest occupies.
    std::size_t residentBytes() const noexcept;

  private:
    friend class ManifestBuilder;
    friend class ManifestPatchList;

    using FileRange = std::pair<std::uint32_t, std::uint32_t>;
    // Ascending. A prefix needs two ranges, or four if it ends within a surrogate pair.
    struct FileRanges {
        FileRange ranges[4] = {};
    };
    struct FileRecord {
        std::uint32_t folder;
        storage::ByteArena::Ref name;
        std::uint32_t firstVersion;
        std::uint32_t versionCount;
        std::uint32_t hash;
    };
    // The folder's text ends in its separator. Its files end at the next folder's first file.
    struct FolderRecord {
        storage::ByteArena::Ref text;
        std::uint32_t firstFile;
    };

    Manifest();
    ~Manifest() = default;
    friend class RefCounted<Manifest>;

    std::uint32_t findFile(std::wstring_view path) const;
    FileRanges filesUnder(std::wstring_view prefix) const;
    // Both return files from one path up to but not including another, which differ in the end of their last component
    // only: those of the folders in between, and those of the folder of both whose names are in between.
    FileRange foldersBetween(std::string_view low, std::string_view high) const noexcept;
    FileRange namesBetween(std::string_view low, std::string_view high) const noexcept;
    // Returns the number of all files for the folder behind the last.
    std::uint32_t firstFileOf(std::uint32_t folder) const noexcept;
    std::uint32_t firstFolderFrom(std::string_view text) const noexcept;
    std::uint32_t firstNameFrom(FileRange files, std::string_view name) const noexcept;

    std::uint32_t textLength_ = 1;
    wxString userText_;
    wxString hash_;
    storage::ByteArena texts_;
    storage::VersionStore versions_;
    BlockArray<FileRecord, 15> files_;
    BlockArray<FolderRecord, 16> folders_;
    storage::HashIndex filesByPath_;
};

inline ManifestPatch ManifestPatchList::operator[](std::size_t i) const noexcept
{
    const std::uint32_t number = first_ + static_cast<std::uint32_t>(i);
    const storage::PackedVersion& version = manifest_->versions_[number];
    std::string_view extra;
    if (manifest_->versions_.hasExtra(number)) {
        storage::ByteArena::Ref ref = 0;
        std::memcpy(&ref, version.digest, sizeof ref);
        extra = manifest_->texts_.at(ref);
    }
    return {version, extra};
}

} // namespace tavi
