#pragma once

#include <wx/string.h>

namespace tavi {

// Puts a name in the place of the text's %s. Not formatting: a percent sign in a name or a slip in a translation stays
// text.
inline wxString withName(wxString text, const wxString& name)
{
    const std::size_t place = text.find(L"%s");
    return place == wxString::npos ? text : text.replace(place, 2, name);
}

} // namespace tavi
