#include "manifest/ManifestBuilder.h"

#include <array>
#include <numeric>
#include <utility>
#include <vector>

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

void ManifestBuilder::keepVersion(std::int64_t aux1, std::int64_t aux2, std::string_view auxText)
{
    storage::PackedVersion& version = versions().next();
    const bool fits = aux1 == 0 && aux2 == 0 && packDigest(auxText, version.digest);
    if (!fits) {
        const storage::Extra extra{aux1, aux2};
        extra_.assign(reinterpret_cast<const char*>(&extra), sizeof extra);
        extra_ += auxText;
        const storage::ByteArena::Ref ref = manifest_->texts_.append(extra_);
        std::memcpy(version.digest, &ref, sizeof ref);
    }
    versions().keep(!fits);
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
    if (lastFolder_ != storage::NumberTable::kNone && texts.at(folders_[lastFolder_].text) == folder)
        return lastFolder_;

    const std::uint32_t hash = storage::hashBytes(0, folder);
    lastFolder_ = foldersByText_.find(hash, [&](std::uint32_t number) {
        return folders_[number].hash == hash && texts.at(folders_[number].text) == folder;
    });
    if (lastFolder_ != storage::NumberTable::kNone)
        return lastFolder_;

    lastFolder_ = folders_.size();
    folders_.push({texts.append(folder), hash, 0});
    if (folders_.size() > foldersByText_.capacity()) {
        foldersByText_.allocate(2 * folders_.size());
        for (std::uint32_t number = 0; number < folders_.size(); ++number)
            foldersByText_.insert(folders_[number].hash, number);
    } else {
        foldersByText_.insert(hash, lastFolder_);
    }
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
        manifest_->filesByPath_.insert(files[file].hash, file);
    return std::move(manifest_);
}

// Sorts the folders and moves each file into its folder's part of the array; the files keep the order of the text.
void ManifestBuilder::orderFolders()
{
    const storage::ByteArena& texts = manifest_->texts_;
    std::vector<std::uint32_t> order(folders_.size());
    std::iota(order.begin(), order.end(), 0u);
    std::sort(order.begin(), order.end(), [&](std::uint32_t a, std::uint32_t b) {
        return texts.at(folders_[a].text) < texts.at(folders_[b].text);
    });

    manifest_->folders_.allocate(folders_.size());
    std::vector<std::uint32_t> rank(folders_.size());
    std::vector<std::uint32_t> place(folders_.size());
    std::uint32_t firstFile = 0;
    for (std::uint32_t i = 0; i < order.size(); ++i) {
        const LoadedFolder& folder = folders_[order[i]];
        manifest_->folders_[i] = {folder.text, firstFile};
        rank[order[i]] = i;
        place[order[i]] = firstFile;
        firstFile += folder.files;
    }
    folders_ = {};

    manifest_->files_.allocate(files_.size());
    for (std::uint32_t i = 0; i < files_.size(); ++i) {
        Manifest::FileRecord record = files_[i];
        const std::uint32_t to = place[record.folder]++;
        record.folder = rank[record.folder];
        manifest_->files_[to] = record;
    }
    files_ = {};
}

// Sorts each folder's files by name and keeps the last of several files of one name.
void ManifestBuilder::orderFiles()
{
    const storage::ByteArena& texts = manifest_->texts_;
    auto& files = manifest_->files_;
    auto& folders = manifest_->folders_;
    std::vector<Manifest::FileRecord> scratch;
    std::uint32_t kept = 0;
    for (std::uint32_t folder = 0; folder < folders.size(); ++folder) {
        const std::uint32_t begin = folders[folder].firstFile;
        const std::uint32_t end = folder + 1 < folders.size() ? folders[folder + 1].firstFile : files.size();
        folders[folder].firstFile = kept;

        bool ordered = true;
        for (std::uint32_t file = begin + 1; ordered && file < end; ++file)
            ordered = texts.at(files[file - 1].name) < texts.at(files[file].name);
        if (ordered && kept == begin) {
            kept = end;
            continue;
        }
        scratch.clear();
        for (std::uint32_t file = begin; file < end; ++file)
            scratch.push_back(files[file]);
        // Versions are numbered in the order of the text, so of two files of one name the later comes last.
        std::sort(scratch.begin(), scratch.end(), [&](const Manifest::FileRecord& a, const Manifest::FileRecord& b) {
            const int order = texts.at(a.name).compare(texts.at(b.name));
            return order != 0 ? order < 0 : a.firstVersion < b.firstVersion;
        });
        for (std::size_t i = 0; i < scratch.size(); ++i) {
            if (i + 1 == scratch.size() || texts.at(scratch[i].name) != texts.at(scratch[i + 1].name))
                files[kept++] = scratch[i];
        }
    }
    files.shrinkTo(kept);
}

} // namespace tavi
