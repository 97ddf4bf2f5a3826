#pragma once

#include <string>
#include <string_view>

#include <wx/string.h>

// Conversions at the database and pipe edges. Pure functions, safe on any thread; they throw only std::bad_alloc.
namespace tavi {

// UTF-8 of a wide string. Where wchar_t is UTF-16, surrogate pairs become one four-byte sequence; a lone surrogate,
// which NTFS allows in names, becomes its three-byte form so that distinct names stay distinct.
std::string toUtf8(std::wstring_view text);

// Appends to `out` instead of making a new string.
void appendUtf8(std::wstring_view text, std::string& out);

// Wide string of UTF-8. Lone surrogates in their three-byte form come back; any other malformed byte becomes U+FFFD.
wxString fromUtf8(std::string_view text);

inline std::wstring_view view(const wxString& text)
{
    return {text.wc_str(), text.length()};
}

} // namespace tavi
