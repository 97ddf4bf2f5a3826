#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include <wx/string.h>

// UTF-8 and the module's wide strings. Lone surrogates, which NTFS allows in names, keep their three-byte form (WTF-8),
// so that distinct names stay distinct. Pure functions, safe on any thread; they throw only std::bad_alloc.
namespace tavi {

inline std::wstring_view view(const wxString& text)
{
    return {text.wc_str(), text.length()};
}

constexpr bool isHighSurrogate(char32_t unit) noexcept
{
    return unit >= 0xD800 && unit <= 0xDBFF;
}

constexpr bool isLowSurrogate(char32_t unit) noexcept
{
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

// Converts a wide string. Where wchar_t is UTF-16, a surrogate pair becomes one four-byte sequence.
std::string toUtf8(std::wstring_view text);
void appendUtf8(std::wstring_view text, std::string& out);

// Converts to a wide string. Each malformed byte becomes U+FFFD.
wxString fromUtf8(std::string_view text);

// The first sequence of a text.
struct Utf8Sequence {
    enum class Form { whole, truncated, malformed };
    Form form;
    // The bytes of a whole sequence, or those present of a truncated one.
    std::size_t length;
    // The code point of a whole sequence.
    char32_t point;
};

// Decodes the first sequence of a non-empty text.
Utf8Sequence decodeUtf8(std::string_view text) noexcept;

// Returns the number of UTF-16 units of well-formed UTF-8.
std::uint32_t countUtf16Units(std::string_view text) noexcept;

// Returns the number of bytes of the first `units` wide characters of a well-formed text.
std::size_t utf8PrefixLength(std::string_view text, std::size_t units) noexcept;

} // namespace tavi
