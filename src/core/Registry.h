#pragma once

#include <optional>
#include <vector>

#include <windows.h>
#include <wx/string.h>

// Registry values, read without logging and without wxWidgets, whose class for keys ends the process without memory.
// Any thread.
namespace tavi {

// Access to a key as the machine's own programs see it: on a 64-bit Windows, the 64-bit view. What Windows stores about
// the machine is there; the 32-bit view may have another value or none.
constexpr REGSAM kReadNative = KEY_READ | KEY_WOW64_64KEY;

// Reads a text value of an open key (REG_SZ, or REG_EXPAND_SZ with its references expanded). Returns 0 or the system's
// error code; then `text` is unchanged.
LSTATUS queryRegistryText(HKEY key, const wchar_t* name, wxString& text);

// The same for a key of the native view; nothing if the key or the value cannot be read.
std::optional<wxString> readRegistryText(HKEY root, const wxString& path, const wxString& name);

// Reads a REG_MULTI_SZ value of the native view; empty if it cannot be read.
std::vector<wxString> readRegistryTexts(HKEY root, const wxString& path, const wxString& name);

} // namespace tavi
