#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "manifest/Manifest.h"

namespace tavi {

// A path split behind its last separator; the folder keeps the separator.
struct SplitPath {
    std::string_view folder;
    std::string_view name;
};

inline SplitPath splitPath(std::string_view path) noexcept
{
    const std::size_t cut = path.rfind('\\') + 1;
    return {path.substr(0, cut), path.substr(cut)};
}

// Packs a text of 40 lower-case hexadecimal digits. Returns false for any other text; `digest` is undefined then.
bool packDigest(std::string_view text, unsigned char (&digest)[20]) noexcept;

// Builds a manifest file by file. One thread.
class ManifestBuilder {
  public:
    ManifestBuilder();

    storage::VersionStore& versions() noexcept
    {
        return manifest_->versions_;
    }
    // Adds the version with these aux values in place of its digest.
    void addVersion(storage::PackedVersion version, std::int64_t aux1, std::int64_t aux2, std::string_view auxText);
    // Adds the file of all versions added since `firstVersion`. It replaces an earlier file of the same path.
    void addFile(std::string_view path, std::uint32_t firstVersion);
    void setUserText(const wxString& text);
    void setHash(const wxString& hash);

    // Returns the manifest. Afterwards the builder may only be destroyed.
    ManifestRef finish(std::uint32_t textLength);

  private:
    struct LoadedFolder {
        storage::ByteArena::Ref text;
        std::uint32_t hash;
        std::uint32_t files;
    };

    using Numbers = BlockArray<std::uint32_t, 18>;

    std::uint32_t internFolder(std::string_view folder);
    void orderFolders();
    void orderFiles();

    RefPtr<Manifest> manifest_;
    BlockArray<Manifest::FileRecord, 15> files_;
    BlockArray<LoadedFolder, 15> folders_;
    storage::HashIndex foldersByText_;
    std::string extra_;
    std::uint32_t lastFolder_ = storage::HashIndex::kNone;
};

} // namespace tavi
