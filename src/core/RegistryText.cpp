#include "core/RegistryText.h"

#include <cwchar>
#include <vector>

namespace tavi {

std::optional<wxString> readRegistryText(HKEY root, const wxString& path, const wxString& name)
{
    std::vector<wchar_t> buffer(MAX_PATH);
    for (;;) {
        DWORD bytes = static_cast<DWORD>(buffer.size()) * DWORD{sizeof(wchar_t)};
        const LONG result =
            RegGetValueW(root, path.wc_str(), name.wc_str(), RRF_RT_REG_SZ, nullptr, buffer.data(), &bytes);
        if (result == ERROR_SUCCESS)
            return wxString(buffer.data(), wcsnlen(buffer.data(), bytes / sizeof(wchar_t)));
        if (result != ERROR_MORE_DATA)
            return std::nullopt;
        // The size that is told may be that of the text before its references are expanded.
        buffer.resize(buffer.size() * 2 + bytes / sizeof(wchar_t));
    }
}

} // namespace tavi
