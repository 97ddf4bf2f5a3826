#pragma once

#include <windows.h>
#include <wx/string.h>
#include <wx/msw/registry.h>

namespace tavi {

// A text value with environment references expanded. False, in silence, when key or value is missing or is no text. Any
// thread.
bool readRegistryText(wxRegKey::StdKey root, const wxString& path, const wxString& name, wxString& text);

} // namespace tavi
