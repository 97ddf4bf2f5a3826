#pragma once

#include <optional>
#include <vector>

#include <windows.h>
#include <wx/string.h>

namespace tavi {

// Reads a text value (REG_SZ, or REG_EXPAND_SZ with its references expanded). Returns nothing, and logs nothing, if the
// key or the value is missing or is of another type. Any thread.
std::optional<wxString> readRegistryText(HKEY root, const wxString& path, const wxString& name);

// Reads a REG_MULTI_SZ value; empty if it cannot be read. Any thread.
std::vector<wxString> readRegistryTexts(HKEY root, const wxString& path, const wxString& name);

} // namespace tavi
