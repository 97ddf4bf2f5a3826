#include "core/Utf8.h"

#include <algorithm>

namespace tavi {
namespace {

constexpr char32_t kReplacement = 0xFFFD;
constexpr char32_t kLastPoint = 0x10FFFF;
constexpr char32_t kFirstSupplementary = 0x10000;

void appendPoint(char32_t point, std::string& out)
{
    const auto continuation = [&](int shift) { out.push_back(static_cast<char>(0x80 | ((point >> shift) & 0x3F))); };
    if (point < 0x80) {
        out.push_back(static_cast<char>(point));
    } else if (point < 0x800) {
        out.push_back(static_cast<char>(0xC0 | (point >> 6)));
        continuation(0);
    } else if (point < kFirstSupplementary) {
        out.push_back(static_cast<char>(0xE0 | (point >> 12)));
        continuation(6);
        continuation(0);
    } else {
        out.push_back(static_cast<char>(0xF0 | (point >> 18)));
        continuation(12);
        continuation(6);
        continuation(0);
    }
}

void appendWide(char32_t point, std::wstring& out)
{
    if constexpr (sizeof(wchar_t) == 2) {
        if (point >= kFirstSupplementary) {
            out.push_back(static_cast<wchar_t>(0xD800 + ((point - kFirstSupplementary) >> 10)));
            out.push_back(static_cast<wchar_t>(0xDC00 + ((point - kFirstSupplementary) & 0x3FF)));
            return;
        }
    }
    out.push_back(static_cast<wchar_t>(point));
}

// Returns the length of the sequence that a byte leads, or 0 if it leads none.
constexpr std::size_t sequenceLength(unsigned char lead) noexcept
{
    return lead < 0x80 ? 1 : lead < 0xC0 ? 0 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF8 ? 4 : 0;
}

constexpr bool isContinuation(unsigned char byte) noexcept
{
    return (byte & 0xC0) == 0x80;
}

} // namespace

void appendUtf8(std::wstring_view text, std::string& out)
{
    for (std::size_t i = 0; i < text.size(); ++i) {
        auto point = static_cast<char32_t>(text[i]);
        if (isHighSurrogate(point) && i + 1 < text.size() && isLowSurrogate(static_cast<char32_t>(text[i + 1])))
            point = kFirstSupplementary + ((point - 0xD800) << 10) + (static_cast<char32_t>(text[++i]) - 0xDC00);
        appendPoint(point, out);
    }
}

std::string toUtf8(std::wstring_view text)
{
    std::string out;
    out.reserve(text.size() + text.size() / 8);
    appendUtf8(text, out);
    return out;
}

wxString fromUtf8(std::string_view text)
{
    std::wstring out;
    out.reserve(text.size());
    while (!text.empty()) {
        const Utf8Sequence sequence = decodeUtf8(text);
        const bool isWhole = sequence.form == Utf8Sequence::Form::whole;
        appendWide(isWhole ? sequence.point : kReplacement, out);
        text.remove_prefix(isWhole ? sequence.length : 1);
    }
    return wxString(out);
}

Utf8Sequence decodeUtf8(std::string_view text) noexcept
{
    constexpr Utf8Sequence kMalformed{Utf8Sequence::Form::malformed, 1, kReplacement};
    constexpr char32_t kSmallest[] = {0, 0x80, 0x800, kFirstSupplementary};
    const auto lead = static_cast<unsigned char>(text[0]);
    if (lead < 0x80)
        return {Utf8Sequence::Form::whole, 1, lead};
    const std::size_t length = sequenceLength(lead);
    if (length == 0)
        return kMalformed;
    char32_t point = lead & (0x7Fu >> length);
    for (std::size_t i = 1; i < length; ++i) {
        if (i == text.size())
            return {Utf8Sequence::Form::truncated, i, kReplacement};
        const auto byte = static_cast<unsigned char>(text[i]);
        if (!isContinuation(byte))
            return kMalformed;
        point = point << 6 | (byte & 0x3Fu);
    }
    if (point < kSmallest[length - 1] || point > kLastPoint)
        return kMalformed;
    return {Utf8Sequence::Form::whole, length, point};
}

std::uint32_t countUtf16Units(std::string_view text) noexcept
{
    std::uint32_t units = 0;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        units += isContinuation(byte) ? 0u : 1u;
        units += byte >= 0xF0 ? 1u : 0u;
    }
    return units;
}

std::size_t utf8PrefixLength(std::string_view text, std::size_t units) noexcept
{
    std::size_t at = 0;
    while (at < text.size() && units > 0) {
        const std::size_t length = std::max<std::size_t>(sequenceLength(static_cast<unsigned char>(text[at])), 1);
        units -= std::min<std::size_t>(units, length == 4 && sizeof(wchar_t) == 2 ? 2 : 1);
        at += length;
    }
    return std::min(at, text.size());
}

} // namespace tavi
