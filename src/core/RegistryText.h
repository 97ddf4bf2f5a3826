#pragma once

#include <optional>

#include <windows.h>
#include <wx/string.h>

namespace tavi {

// A text value with environment references expanded; nothing, in silence, when key or value is missing or is no text.
// Any thread.
std::optional<wxString> readRegistryText(HKEY root, const wxString& path, const wxString& name);

} // namespace tavi
