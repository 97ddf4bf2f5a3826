#include "manifest/Manifest.h"

#include "core/Utf8.h"
#include "manifest/ManifestParser.h"

namespace tavi {
namespace {

// The hash of a manifest without a hash line: the SHA-1 digest of no bytes.
constexpr const wchar_t* kEmptyInputHash = L"da39a3ee5e6b4b0d3255bfef95601890afd80709";

constexpr wchar_t kFirstLowSurrogate = 0xDC00;
constexpr wchar_t kLastLowSurrogate = 0xDFFF;

storage::Extra extraOf(std::string_view bytes) noexcept
{
    storage::Extra extra{};
    if (bytes.size() >= sizeof extra)
        std::memcpy(&extra, bytes.data(), sizeof extra);
    return extra;
}

} // namespace

std::int64_t ManifestPatch::aux1() const noexcept
{
    return extraOf(extra_).aux1;
}

std::int64_t ManifestPatch::aux2() const noexcept
{
    return extraOf(extra_).aux2;
}

wxString ManifestPatch::auxText() const
{
    if (!extra_.empty())
        return fromUtf8(extra_.substr(sizeof(storage::Extra)));
    std::string text;
    text.reserve(2 * sizeof version_->digest);
    for (const unsigned char byte : version_->digest) {
        text.push_back("0123456789abcdef"[byte >> 4]);
        text.push_back("0123456789abcdef"[byte & 15]);
    }
    return fromUtf8(text);
}

std::optional<std::size_t> ManifestPatchList::newestUpTo(std::uint32_t time) const noexcept
{
    for (std::size_t i = size(); i-- > 0;) {
        if (manifest_->versions_[first_ + static_cast<std::uint32_t>(i)].timestamp <= time)
            return i;
    }
    return std::nullopt;
}

bool ManifestPatchList::existsAt(std::uint32_t time) const noexcept
{
    // No timestamp is above kAnyTime. A restore, which must not bring back anything newer than its time, takes 0 as
    // 1970 instead.
    const auto deciding = newestUpTo(time == 0 ? kAnyTime : time);
    return deciding && !(*this)[*deciding].isDeletion();
}

Manifest::Manifest() : hash_(kEmptyInputHash) {}

ManifestRef Manifest::parse(const wxString& text)
{
    // In slices, so that there is never a second copy of the whole text. The parser joins surrogate pairs that a slice
    // cuts in two.
    constexpr std::size_t kSlice = 16 * 1024;
    ManifestParser parser;
    std::string bytes;
    std::uint32_t units = 0;
    for (std::wstring_view rest = view(text); !rest.empty();) {
        const std::size_t length = std::min(rest.size(), kSlice);
        bytes.clear();
        appendUtf8(rest.substr(0, length), bytes);
        units += countUtf16Units(bytes);
        parser.feed(bytes.data(), bytes.size());
        rest.remove_prefix(length);
    }
    return parser.finish(units);
}

bool Manifest::isBackedUp(std::wstring_view path, std::uint32_t time) const
{
    const std::uint32_t file = findFile(path);
    return file != storage::HashIndex::kNone && (time == kAnyTime || patches(file).existsAt(time));
}

bool Manifest::hasBackedUpUnder(std::wstring_view prefix, std::uint32_t time) const
{
    bool found = false;
    forEachUnder(prefix, [&](std::uint32_t file) {
        found = time == kAnyTime || patches(file).existsAt(time);
        return !found;
    });
    return found;
}

std::optional<ManifestPatchList> Manifest::findPatches(std::wstring_view path) const
{
    const std::uint32_t file = findFile(path);
    if (file == storage::HashIndex::kNone)
        return std::nullopt;
    return patches(file);
}

wxString Manifest::filePath(std::uint32_t file) const
{
    std::string path;
    appendFilePathUtf8(file, path);
    return fromUtf8(path);
}

void Manifest::appendFilePathUtf8(std::uint32_t file, std::string& out) const
{
    out += texts_.at(folders_[files_[file].folder].text);
    out += texts_.at(files_[file].name);
}

std::size_t Manifest::residentBytes() const noexcept
{
    return texts_.bytes() + versions_.bytes() + files_.bytes() + folders_.bytes() + filesByPath_.bytes() +
           (userText_.capacity() + hash_.capacity()) * sizeof(wchar_t) + sizeof *this;
}

std::uint32_t Manifest::findFile(std::wstring_view path) const
{
    const std::string bytes = toUtf8(path);
    const SplitPath split = splitPath(bytes);
    const std::uint32_t hash = storage::hashBytes(storage::hashBytes(0, split.folder), split.name);
    return filesByPath_.find(hash, [&](std::uint32_t file) {
        const FileRecord& record = files_[file];
        return record.hash == hash && texts_.at(record.name) == split.name &&
               texts_.at(folders_[record.folder].text) == split.folder;
    });
}

// The paths that begin with a text are those from the text itself up to the text and kAboveAll.
Manifest::FileRanges Manifest::filesUnder(std::wstring_view prefix) const
{
    // Not part of UTF-8, so greater than every continuation of a path.
    constexpr char kAboveAll = '\xFF';
    const std::string low = toUtf8(prefix), high = low + kAboveAll;
    FileRanges found{{namesBetween(low, high), {}, foldersBetween(low, high), {}}};
    if (!prefix.empty() && isHighSurrogate(static_cast<char32_t>(prefix.back()))) {
        // The prefix ends within a character: paths with any character that begins with this half match too.
        const std::wstring half(prefix);
        const std::string first = toUtf8(half + kFirstLowSurrogate);
        const std::string last = toUtf8(half + kLastLowSurrogate) + kAboveAll;
        found.ranges[1] = namesBetween(first, last);
        found.ranges[3] = foldersBetween(first, last);
    }
    return found;
}

Manifest::FileRange Manifest::foldersBetween(std::string_view low, std::string_view high) const noexcept
{
    return {firstFileOf(firstFolderFrom(low)), firstFileOf(firstFolderFrom(high))};
}

Manifest::FileRange Manifest::namesBetween(std::string_view low, std::string_view high) const noexcept
{
    const SplitPath split = splitPath(low);
    const std::uint32_t folder = firstFolderFrom(split.folder);
    if (split.name.empty() || folder == folders_.size() || texts_.at(folders_[folder].text) != split.folder)
        return {};
    const FileRange files{firstFileOf(folder), firstFileOf(folder + 1)};
    return {firstNameFrom(files, split.name), firstNameFrom(files, splitPath(high).name)};
}

std::uint32_t Manifest::firstFileOf(std::uint32_t folder) const noexcept
{
    return folder < folders_.size() ? folders_[folder].firstFile : files_.size();
}

std::uint32_t Manifest::firstFolderFrom(std::string_view text) const noexcept
{
    std::uint32_t low = 0;
    for (std::uint32_t high = folders_.size(); low < high;) {
        const std::uint32_t middle = low + (high - low) / 2;
        if (texts_.at(folders_[middle].text) < text)
            low = middle + 1;
        else
            high = middle;
    }
    return low;
}

std::uint32_t Manifest::firstNameFrom(FileRange files, std::string_view name) const noexcept
{
    while (files.first < files.second) {
        const std::uint32_t middle = files.first + (files.second - files.first) / 2;
        if (texts_.at(files_[middle].name) < name)
            files.first = middle + 1;
        else
            files.second = middle;
    }
    return files.first;
}

} // namespace tavi
