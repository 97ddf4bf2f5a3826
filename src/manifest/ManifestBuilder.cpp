#include "manifest/ManifestBuilder.h"

#include <algorithm>
#include <array>
#include <numeric>
#include <utility>

namespace tavi {
namespace {

constexpr unsigned char kNoDigit = 0xFF;

constexpr std::array<unsigned char, 256> hexValues() noexcept
{
    std::array<unsigned char, 256> values{};
    for (auto& value : values)
        value = kNoDigit;
    for (unsigned char digit = 0; digit < 16; ++digit)
        values[static_cast<unsigned char>("0123456789abcdef"[digit])] = digit;
    return values;
}
constexpr auto kHexValues = hexValues();

} // namespace

bool packDigest(std::string_view text, unsigned char (&digest)[20]) noexcept
{
    if (text.size() != 2 * sizeof digest)
        return false;
    unsigned char wrong = 0;
    for (std::size_t i = 0; i < sizeof digest; ++i) {
        const unsigned char high = kHexValues[static_cast<unsigned char>(text[2 * i])];
        const unsigned char low = kHexValues[static_cast<unsigned char>(text[2 * i + 1])];
        wrong |= static_cast<unsigned char>(high | low);
        digest[i] = static_cast<unsigned char>(high << 4 | low);
    }
    return wrong < 16;
}

ManifestBuilder::ManifestBuilder() : manifest_(new Manifest) {}

void ManifestBuilder::addVersion(storage::PackedVersion version, std::int64_t aux1, std::int64_t aux2,
                                 std::string_view auxText)
{
    const bool fits = aux1 == 0 && aux2 == 0 && packDigest(auxText, version.digest);
    if (!fits) {
        const storage::Extra extra{aux1, aux2};
        extra_.assign(reinterpret_cast<const char*>(&extra), sizeof extra);
        extra_ += auxText;
        const storage::ByteArena::Ref ref = manifest_->texts_.append(extra_);
        std::memcpy(version.digest, &ref, sizeof ref);
    }
    versions().push(version, !fits);
}

void ManifestBuilder::addFile(std::string_view path, std::uint32_t firstVersion)
{
    const SplitPath split = splitPath(path);
    const std::uint32_t folder = internFolder(split.folder);
    const std::uint32_t hash = storage::hashBytes(folders_[folder].hash, split.name);
    files_.push({folder, manifest_->texts_.append(split.name), firstVersion, versions().size() - firstVersion, hash});
    ++folders_[folder].files;
}

void ManifestBuilder::setUserText(const wxString& text)
{
    manifest_->userText_ = text;
}

void ManifestBuilder::setHash(const wxString& hash)
{
    manifest_->hash_ = hash;
}

std::uint32_t ManifestBuilder::internFolder(std::string_view folder)
{
    storage::ByteArena& texts = manifest_->texts_;
    // The service writes its files folder by folder.
    if (lastFolder_ != storage::HashIndex::kNone && texts.at(folders_[lastFolder_].text) == folder)
        return lastFolder_;

    const std::uint32_t hash = storage::hashBytes(0, folder);
    lastFolder_ = foldersByText_.find(hash, [&](std::uint32_t number) {
        return folders_[number].hash == hash && texts.at(folders_[number].text) == folder;
    });
    if (lastFolder_ != storage::HashIndex::kNone)
        return lastFolder_;

    lastFolder_ = folders_.size();
    folders_.push({texts.append(folder), hash, 0});
    foldersByText_.push([this](std::uint32_t number) { return folders_[number].hash; });
    return lastFolder_;
}

ManifestRef ManifestBuilder::finish(std::uint32_t textLength)
{
    manifest_->textLength_ = textLength;
    foldersByText_ = {};
    orderFolders();
    orderFiles();

    const auto& files = manifest_->files_;
    manifest_->filesByPath_.allocate(files.size());
    for (std::uint32_t file = 0; file < files.size(); ++file)
        manifest_->filesByPath_.push([&](std::uint32_t number) { return files[number].hash; });
    return std::move(manifest_);
}

// Sorts the folders and moves each file into its folder's part of the array; the files keep the order of the text.
// Leaves the end of a folder's part in the place of its first file.
void ManifestBuilder::orderFolders()
{
    const storage::ByteArena& texts = manifest_->texts_;
    Numbers order, rank;
    order.allocate(folders_.size());
    rank.allocate(folders_.size());
    std::iota(order.begin(), order.end(), 0u);
    std::sort(order.begin(), order.end(), [&](std::uint32_t a, std::uint32_t b) {
        return texts.at(folders_[a].text) < texts.at(folders_[b].text);
    });

    auto& folders = manifest_->folders_;
    folders.allocate(folders_.size());
    std::uint32_t firstFile = 0;
    for (std::uint32_t i = 0; i < order.size(); ++i) {
        const LoadedFolder& folder = folders_[order[i]];
        folders[i] = {folder.text, firstFile};
        rank[order[i]] = i;
        firstFile += folder.files;
    }
    folders_ = {};

    manifest_->files_.allocate(files_.size());
    for (Manifest::FileRecord record : files_) {
        record.folder = rank[record.folder];
        manifest_->files_[folders[record.folder].firstFile++] = record;
    }
    files_ = {};
}

// Sorts each folder's files by name and keeps the last of several files of one name.
void ManifestBuilder::orderFiles()
{
    using File = Manifest::FileRecord;
    auto& files = manifest_->files_;
    const auto name = [&](const File& file) { return manifest_->texts_.at(file.name); };
    std::uint32_t kept = 0;
    auto first = files.begin();
    for (auto& folder : manifest_->folders_) {
        const std::uint32_t endFile = std::exchange(folder.firstFile, kept);
        const auto end = files.begin() + static_cast<std::ptrdiff_t>(endFile);
        auto last = end;
        if (std::adjacent_find(first, last, [&](const File& a, const File& b) { return name(a) >= name(b); }) != last) {
            // Versions are numbered in the order of the text, so of several files of one name the last one comes first.
            std::sort(first, last, [&](const File& a, const File& b) {
                const int order = name(a).compare(name(b));
                return order != 0 ? order < 0 : a.firstVersion > b.firstVersion;
            });
            last = std::unique(first, last, [&](const File& a, const File& b) { return name(a) == name(b); });
        }
        for (; first != last; ++first)
            files[kept++] = *first;
        first = end;
    }
    files.shrinkTo(kept);
}

} // namespace tavi
