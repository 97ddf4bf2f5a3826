#include "core/RegistryText.h"

namespace tavi {

bool readRegistryText(wxRegKey::StdKey root, const wxString& path, const wxString& name, wxString& text)
{
    // Asked before it is read: the library logs what it cannot read.
    wxRegKey key(root, path);
    if (!key.Exists() || !key.Open(wxRegKey::Read) || !key.HasValue(name))
        return false;
    const wxRegKey::ValueType type = key.GetValueType(name);
    return (type == wxRegKey::Type_String || type == wxRegKey::Type_Expand_String) && key.QueryValue(name, text);
}

} // namespace tavi
