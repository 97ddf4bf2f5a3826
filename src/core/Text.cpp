#include "core/Text.h"

#include <cstddef>
#include <cstdint>

namespace tavi {
namespace {

constexpr char32_t kReplacement = 0xFFFD;

bool isHighSurrogate(char32_t unit)
{
    return unit >= 0xD800 && unit <= 0xDBFF;
}

bool isLowSurrogate(char32_t unit)
{
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

void appendCodePoint(char32_t point, std::string& out)
{
    const auto tail = [&](int shift) { out.push_back(static_cast<char>(0x80 | ((point >> shift) & 0x3F))); };
    if (point < 0x80) {
        out.push_back(static_cast<char>(point));
    } else if (point < 0x800) {
        out.push_back(static_cast<char>(0xC0 | (point >> 6)));
        tail(0);
    } else if (point < 0x10000) {
        out.push_back(static_cast<char>(0xE0 | (point >> 12)));
        tail(6);
        tail(0);
    } else {
        out.push_back(static_cast<char>(0xF0 | (point >> 18)));
        tail(12);
        tail(6);
        tail(0);
    }
}

// Reads one code point at `at` and moves behind it; a malformed byte is passed over alone.
char32_t nextCodePoint(std::string_view text, std::size_t& at)
{
    const auto lead = static_cast<unsigned char>(text[at++]);
    if (lead < 0x80)
        return lead;
    const std::size_t tails = lead >= 0xF0 ? 3 : lead >= 0xE0 ? 2 : 1;
    if (lead < 0xC2 || lead > 0xF4 || text.size() - at < tails)
        return kReplacement;
    char32_t point = lead & (0x3Fu >> tails);
    for (std::size_t i = 0; i < tails; ++i) {
        const auto byte = static_cast<unsigned char>(text[at + i]);
        if ((byte & 0xC0) != 0x80)
            return kReplacement;
        point = (point << 6) | (byte & 0x3Fu);
    }
    constexpr char32_t smallest[] = {0, 0x80, 0x800, 0x10000};
    if (point < smallest[tails] || point > 0x10FFFF)
        return kReplacement;
    at += tails;
    return point;
}

void appendWide(char32_t point, std::wstring& out)
{
    if constexpr (sizeof(wchar_t) == 2) {
        if (point >= 0x10000) {
            out.push_back(static_cast<wchar_t>(0xD800 + ((point - 0x10000) >> 10)));
            out.push_back(static_cast<wchar_t>(0xDC00 + ((point - 0x10000) & 0x3FF)));
            return;
        }
    }
    out.push_back(static_cast<wchar_t>(point));
}

} // namespace

void appendUtf8(std::wstring_view text, std::string& out)
{
    for (std::size_t i = 0; i < text.size(); ++i) {
        auto point = static_cast<char32_t>(text[i]);
        if (isHighSurrogate(point) && i + 1 < text.size() && isLowSurrogate(static_cast<char32_t>(text[i + 1])))
            point = 0x10000 + ((point - 0xD800) << 10) + (static_cast<char32_t>(text[++i]) - 0xDC00);
        appendCodePoint(point, out);
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
    for (std::size_t at = 0; at < text.size();)
        appendWide(nextCodePoint(text, at), out);
    return wxString(out);
}

} // namespace tavi
