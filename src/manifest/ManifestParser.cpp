#include "manifest/ManifestParser.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <new>

#include <wx/log.h>

#include "core/Utf8.h"

namespace tavi {
namespace {

constexpr std::string_view kUserHeader = "USER";
constexpr std::string_view kFilesHeader = "FILES";
constexpr std::string_view kHashMark = "_hash|";
constexpr unsigned kSeparatorNewlines = 3;
constexpr std::size_t kMostFields = 8;

bool isDigit(char c) noexcept
{
    return c >= '0' && c <= '9';
}

// Lenient: leading white space and a sign are allowed, the first character that is no digit ends the number, nothing
// gives 0. What does not fit wraps, so that a negative time and one beyond 2038 keep their 32 bits.
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

// A pair of surrogates in their three-byte forms is one character in the wide text, and must be found as such.
std::string joinSurrogates(std::string_view text)
{
    return toUtf8(view(fromUtf8(text)));
}

bool mayHaveSurrogates(std::string_view text) noexcept
{
    return text.find('\xED') != std::string_view::npos;
}

const char* findNewline(const char* at, const char* end) noexcept
{
    constexpr std::uint32_t kOnes = 0x01010101u;
    for (std::uint32_t word = 0; end - at >= 4; at += 4) {
        std::memcpy(&word, at, sizeof word);
        word ^= '\n' * kOnes;
        if (((word - kOnes) & ~word & (kOnes << 7)) != 0)
            break;
    }
    while (at != end && *at != '\n')
        ++at;
    return at;
}

// Reads up to nine digits, which always fit, and passes over the colon behind them.
bool readShort(const char*& at, std::uint32_t& number) noexcept
{
    const char* from = at;
    number = 0;
    while (isDigit(*at))
        number = number * 10 + static_cast<std::uint32_t>(*at++ - '0');
    return at != from && at - from <= 9 && *at++ == ':';
}

bool readTime(const char*& at, std::uint32_t& number) noexcept
{
    const char* from = at;
    number = 0;
    while (isDigit(*at))
        number = number * 10 + static_cast<std::uint32_t>(*at++ - '0');
    return at != from && *at++ == ':';
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
        const char* const newline = findNewline(at, end);
        const std::string_view part(at, static_cast<std::size_t>(newline - at));
        if (newline == end) {
            keepForLater(part);
            return;
        }
        at = newline + 1;
        if (carry_.empty()) {
            endLine(part);
        } else {
            carry_ += part;
            endLine(carry_);
            carry_.clear();
        }
    }
}

// The form that nearly every line has, taken in one pass: eight fields, plain numbers, nothing to carry but a digest.
// Stops before the first line that is anything else; the zero byte behind the slice looks like one.
const char* ManifestParser::feedVersions(const char* at, const char* end)
{
    storage::VersionStore& versions = builder_->versions();
    while (at != end && isDigit(*at) && versions.hasRoom()) {
        const char* field = at;
        storage::PackedVersion& version = versions.next();
        if (!readTime(field, version.timestamp) || !readTime(field, version.modifiedTime) ||
            !readTime(field, version.ctime) || !readShort(field, version.sizeLow) || !readZero(field))
            break;
        version.sizeHigh = 0;
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
        versions.keep();
        at = field + 1;
    }
    return at;
}

void ManifestParser::keepForLater(std::string_view part)
{
    if (section_ == Section::kHeader && carry_.size() + part.size() > kFilesHeader.size())
        section_ = Section::kSkipped;
    if (section_ == Section::kSkipped)
        // That the line is not empty is all that matters of it.
        carry_ = "?";
    else
        carry_ += part;
}

void ManifestParser::endLine(std::string_view line)
{
    newlines_ = line.empty() ? newlines_ + 1 : 1;
    if (newlines_ == kSeparatorNewlines) {
        // The newlines of the separator belong to no section.
        if (section_ == Section::kUser && userText_.size() < kSeparatorNewlines - 1)
            section_ = Section::kSkipped;
        else if (section_ == Section::kUser)
            userText_.resize(userText_.size() - (kSeparatorNewlines - 1));
        endSection();
        return;
    }
    switch (section_) {
    case Section::kHeader:
        section_ = line == kUserHeader ? Section::kUser : line == kFilesHeader ? Section::kFiles : Section::kSkipped;
        break;
    case Section::kUser:
        userText_ += line;
        userText_ += '\n';
        break;
    case Section::kFiles:
        fileLine(line, false);
        break;
    case Section::kSkipped:
        break;
    }
}

void ManifestParser::endSection()
{
    if (section_ == Section::kUser)
        endUserSection();
    if (section_ == Section::kFiles)
        flushFile();
    userText_.clear();
    section_ = Section::kHeader;
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

void ManifestParser::fileLine(std::string_view line, bool last)
{
    if (hasPath_) {
        // The empty line behind a lone newline at the end of the text is a version of zeros: the format has it so.
        if (line.empty() && !last)
            flushFile();
        else
            patchLine(line);
    } else if (!line.empty()) {
        if (mayHaveSurrogates(line))
            path_ = joinSurrogates(line);
        else
            path_ = line;
        hasPath_ = true;
        firstVersion_ = builder_->versions().size();
    }
}

void ManifestParser::patchLine(std::string_view line)
{
    if (addPatch(line))
        return;
    wxLogError("Invalid patch in manifest: %s", fromUtf8(line));
    builder_.reset();
    hasPath_ = false;
    wxLogError("Attempting to parse invalid manifest");
}

bool ManifestParser::addPatch(std::string_view line)
{
    std::array<std::string_view, kMostFields> fields;
    std::size_t count = 0;
    for (std::size_t at = 0; at <= line.size();) {
        if (count == kMostFields)
            return false;
        const std::size_t colon = std::min(line.find(':', at), line.size());
        fields[count++] = line.substr(at, colon - at);
        at = colon + 1;
    }

    // Fields that are not there are empty, and so 0. Seven fields are laid out as six, the last of them given twice.
    const std::size_t times = count == 8 ? 3 : count >= 6 ? 2 : 1;
    const std::string_view* rest = fields.data() + times;
    const std::string_view aux2 = count == 7 ? fields[6] : rest[3];
    try {
        storage::PackedVersion& version = builder_->versions().next();
        version.timestamp = count >= 6 ? toTime(fields[0]) : 0;
        version.modifiedTime = toTime(fields[times >= 2 ? 1 : 0]);
        version.ctime = count == 8 ? toTime(fields[2]) : 0;
        const std::uint64_t size = toNumber(rest[0]);
        version.sizeLow = static_cast<std::uint32_t>(size);
        version.sizeHigh = static_cast<std::uint32_t>(size >> 32);
        version.attributes = count == 8 ? static_cast<std::uint32_t>(toNumber(fields[7], 8)) : 0;
        builder_->keepVersion(toSize(rest[1]), toSize(aux2), rest[2]);
    } catch (const std::bad_alloc&) {
        // A version for which there is no memory makes its line invalid.
        return false;
    }
    return true;
}

void ManifestParser::flushFile()
{
    if (hasPath_ && builder_->versions().size() > firstVersion_)
        builder_->addFile(path_, firstVersion_);
    hasPath_ = false;
}

ManifestRef ManifestParser::finish(std::uint32_t units)
{
    if (builder_ && section_ == Section::kUser)
        userText_ += carry_;
    if (builder_ && section_ == Section::kFiles)
        fileLine(carry_, true);
    if (!builder_)
        return {};
    endSection();
    return builder_->finish(units + 1);
}

} // namespace tavi
