#pragma once

#include <string_view>
#include <unordered_set>

#include <wx/string.h>

#include "core/Utf8.h"

namespace tavi {

struct PathHash {
    std::size_t operator()(const wxString& path) const
    {
        return std::hash<std::wstring_view>()(view(path));
    }
};

// Full paths, compared exactly, letter case included.
using PathSet = std::unordered_set<wxString, PathHash>;

} // namespace tavi
