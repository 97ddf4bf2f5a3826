#include "manifest/ManifestParser.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <new>

#include "core/LogLine.h"
#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::string_view kUserHeader = "USER";
constexpr std::string_view kFilesHeader = "FILES";
constexpr std::string_view kHashMark = "_hash|";
constexpr unsigned kSeparatorNewlines = 3;
// A line of the log has room for no more.
constexpr std::size_t kMaxLoggedBytes = std::size_t{3} * 4095;

// The values of a version, in the order of the longest line.
enum Value { kTimestamp, kModifiedTime, kCtime, kFileSize, kAux1, kAuxText, kAux2, kAttributes, kValueCount };
constexpr Value kWithoutTimestamp[] = {kModifiedTime, kFileSize, kAux1, kAuxText, kAux2};
// A seventh field replaces the sixth.
constexpr Value kWithTimestamp[] = {kTimestamp, kModifiedTime, kFileSize, kAux1, kAuxText, kAux2, kAux2};
constexpr Value kComplete[] = {kTimestamp, kModifiedTime, kCtime, kFileSize, kAux1, kAuxText, kAux2, kAttributes};
// The value of each field of a line, by the number of its fields less one.
constexpr const Value* kLayouts[] = {kWithoutTimestamp, kWithoutTimestamp, kWithoutTimestamp, kWithoutTimestamp,
                                     kWithoutTimestamp, kWithTimestamp,    kWithTimestamp,    kComplete};

// Every number of so many digits fits 32 bits.
constexpr std::ptrdiff_t kMaxSizeDigits = 9;

bool isDigit(char c) noexcept
{
    return c >= '0' && c <= '9';
}

// Converts leniently: allows leading white space and a sign, ends at the first character that is no digit, and returns
// 0 without digits. A number that is too large wraps, so that a negative time and one beyond 2038 keep their 32 bits.
std::uint64_t toNumber(std::string_view text, unsigned base = 10) noexcept
{
    std::size_t at = std::min(text.find_first_not_of(" \t\v\f\r"), text.size());
    const bool negative = at < text.size() && text[at] == '-';
    if (at < text.size() && (text[at] == '-' || text[at] == '+'))
        ++at;
    std::uint64_t number = 0;
    for (; at < text.size() && text[at] >= '0' && static_cast<unsigned>(text[at] - '0') < base; ++at)
        number = number * base + static_cast<unsigned>(text[at] - '0');
    return negative ? 0 - number : number;
}

std::uint32_t toTime(std::string_view text) noexcept
{
    return static_cast<std::uint32_t>(toNumber(text));
}

std::int64_t toSize(std::string_view text) noexcept
{
    return static_cast<std::int64_t>(toNumber(text));
}

// Converts each pair of surrogates in three-byte form to one sequence of four bytes, the form in which a wide path is
// looked up.
std::string joinSurrogates(std::string_view text)
{
    return toUtf8(view(fromUtf8(text)));
}

bool mayHaveSurrogates(std::string_view text) noexcept
{
    return text.find('\xED') != std::string_view::npos;
}

// Reads digits, which wrap, and the colon behind them. Returns the number of digits, 0 without a colon.
std::ptrdiff_t readNumber(const char*& at, std::uint32_t& number) noexcept
{
    const char* const from = at;
    number = 0;
    while (isDigit(*at))
        number = number * 10 + static_cast<std::uint32_t>(*at++ - '0');
    const std::ptrdiff_t digits = at - from;
    return *at++ == ':' ? digits : 0;
}

bool readTime(const char*& at, std::uint32_t& number) noexcept
{
    return readNumber(at, number) != 0;
}

bool readSize(const char*& at, std::uint32_t& number) noexcept
{
    const std::ptrdiff_t digits = readNumber(at, number);
    return digits != 0 && digits <= kMaxSizeDigits;
}

bool readZero(const char*& at) noexcept
{
    if (at[0] != '0' || at[1] != ':')
        return false;
    at += 2;
    return true;
}

} // namespace

ManifestParser::ManifestParser() : builder_(std::in_place) {}

void ManifestParser::feed(const char* bytes, std::size_t length)
{
    const char* const end = bytes + length;
    for (const char* at = bytes; at != end && builder_;) {
        if (hasPath_ && carry_.empty()) {
            at = feedVersions(at, end);
            if (at == end)
                return;
        }
        const std::string_view rest(at, static_cast<std::size_t>(end - at));
        const std::string_view part = rest.substr(0, rest.find('\n'));
        if (part.size() == rest.size()) {
            carry(part);
            return;
        }
        at += part.size() + 1;
        if (carry_.empty()) {
            endLine(part);
        } else {
            carry_ += part;
            endLine(carry_);
            carry_.clear();
        }
    }
}

// Parses lines of the most frequent form in one pass: eight fields of plain numbers, the aux text a digest and the
// other aux values 0. Returns the first line of any other form, or the end. The zero byte behind the slice matches no
// field.
const char* ManifestParser::feedVersions(const char* at, const char* end)
{
    storage::VersionStore& versions = builder_->versions();
    storage::PackedVersion version{};
    while (at != end && isDigit(*at)) {
        const char* field = at;
        if (!readTime(field, version.timestamp) || !readTime(field, version.modifiedTime) ||
            !readTime(field, version.ctime) || !readSize(field, version.sizeLow) || !readZero(field))
            break;
        constexpr std::ptrdiff_t kDigest = 2 * sizeof version.digest;
        if (end - field < kDigest || !packDigest({field, kDigest}, version.digest))
            break;
        field += kDigest;
        if (*field++ != ':' || !readZero(field))
            break;
        version.attributes = 0;
        while (*field >= '0' && *field <= '7')
            version.attributes = version.attributes * 8 + static_cast<std::uint32_t>(*field++ - '0');
        if (*field != '\n')
            break;
        try {
            versions.push(version);
        } catch (const std::bad_alloc&) {
            break; // addPatch, which tries it again, counts the line as invalid.
        }
        at = field + 1;
    }
    return at;
}

void ManifestParser::carry(std::string_view part)
{
    if (section_ == Section::header && carry_.size() + part.size() > kFilesHeader.size())
        section_ = Section::skipped;
    if (section_ == Section::skipped)
        // Only whether the line is empty matters.
        carry_ = "?";
    else
        carry_ += part;
}

void ManifestParser::endLine(std::string_view line)
{
    newlines_ = line.empty() ? newlines_ + 1 : 1;
    if (newlines_ == kSeparatorNewlines) {
        // The newlines of the separator are not part of the section.
        if (section_ == Section::user && userText_.size() < kSeparatorNewlines - 1)
            section_ = Section::skipped;
        else if (section_ == Section::user)
            userText_.resize(userText_.size() - (kSeparatorNewlines - 1));
        endSection();
        return;
    }
    switch (section_) {
    case Section::header:
        section_ = line == kUserHeader ? Section::user : line == kFilesHeader ? Section::files : Section::skipped;
        break;
    case Section::user:
        userText_ += line;
        userText_ += '\n';
        break;
    case Section::files:
        addFileLine(line, false);
        break;
    case Section::skipped:
        break;
    }
}

void ManifestParser::endSection()
{
    if (section_ == Section::user)
        endUserSection();
    if (section_ == Section::files)
        endFile();
    userText_.clear();
    section_ = Section::header;
    newlines_ = 0;
}

void ManifestParser::endUserSection()
{
    for (std::size_t at = 0; at < userText_.size();) {
        const std::size_t newline = std::min(userText_.find('\n', at), userText_.size());
        const std::string_view line(userText_.data() + at, newline - at);
        if (line.substr(0, kHashMark.size()) == kHashMark) {
            builder_->setHash(fromUtf8(line.substr(kHashMark.size())));
            userText_.erase(at, newline + 1 - at);
            break;
        }
        at = newline + 1;
    }
    builder_->setUserText(fromUtf8(userText_));
}

void ManifestParser::addFileLine(std::string_view line, bool isLast)
{
    if (hasPath_) {
        // Behind a newline at the end of the text one more line begins, empty: a version of zeros. The service parses
        // its manifests alike, and both must see the same versions.
        if (line.empty() && !isLast)
            endFile();
        else
            addPatchLine(line);
    } else if (!line.empty()) {
        if (mayHaveSurrogates(line))
            path_ = joinSurrogates(line);
        else
            path_ = line;
        hasPath_ = true;
        firstVersion_ = builder_->versions().size();
    }
}

void ManifestParser::addPatchLine(std::string_view line)
{
    if (addPatch(line))
        return;
    logError(L"Invalid patch in manifest: %ls", fromUtf8(line.substr(0, kMaxLoggedBytes)).wc_str());
    builder_.reset();
    hasPath_ = false;
    logError(L"Attempting to parse invalid manifest");
}

bool ManifestParser::addPatch(std::string_view line)
{
    const auto colons = static_cast<std::size_t>(std::count(line.begin(), line.end(), ':'));
    if (colons >= std::size(kLayouts))
        return false;
    // Missing values are empty and so 0.
    std::array<std::string_view, kValueCount> values;
    for (std::size_t field = 0; field <= colons; ++field) {
        const std::size_t length = std::min(line.find(':'), line.size());
        values[kLayouts[colons][field]] = line.substr(0, length);
        line.remove_prefix(std::min(length + 1, line.size()));
    }
    try {
        storage::PackedVersion version{};
        version.timestamp = toTime(values[kTimestamp]);
        version.modifiedTime = toTime(values[kModifiedTime]);
        version.ctime = toTime(values[kCtime]);
        const std::uint64_t size = toNumber(values[kFileSize]);
        version.sizeLow = static_cast<std::uint32_t>(size);
        version.sizeHigh = static_cast<std::uint32_t>(size >> 32);
        version.attributes = static_cast<std::uint32_t>(toNumber(values[kAttributes], 8));
        builder_->addVersion(version, toSize(values[kAux1]), toSize(values[kAux2]), values[kAuxText]);
    } catch (const std::bad_alloc&) {
        // Without memory for the version its line counts as invalid, which the callers handle and log.
        return false;
    }
    return true;
}

void ManifestParser::endFile()
{
    if (hasPath_ && builder_->versions().size() > firstVersion_)
        builder_->addFile(path_, firstVersion_);
    hasPath_ = false;
}

ManifestRef ManifestParser::finish(std::uint32_t units)
{
    if (builder_ && section_ == Section::user)
        userText_ += carry_;
    if (builder_ && section_ == Section::files)
        addFileLine(carry_, true);
    if (!builder_)
        return {};
    endSection();
    return builder_->finish(units + 1);
}

} // namespace tavi
