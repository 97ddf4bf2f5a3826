#include "core/Registry.h"

#include <cwchar>
#include <vector>

#include "core/Handles.h"

namespace tavi {

LSTATUS queryRegistryText(HKEY key, const wchar_t* name, wxString& text)
{
    std::vector<wchar_t> buffer(MAX_PATH);
    for (;;) {
        DWORD bytes = static_cast<DWORD>(buffer.size()) * DWORD{sizeof(wchar_t)};
        const LSTATUS status = RegGetValueW(key, nullptr, name, RRF_RT_REG_SZ, nullptr, buffer.data(), &bytes);
        if (status == ERROR_SUCCESS)
            text.assign(buffer.data(), wcsnlen(buffer.data(), bytes / sizeof(wchar_t)));
        if (status != ERROR_MORE_DATA)
            return status;
        // RegGetValue may report the size before references are expanded, which is too small.
        buffer.resize(buffer.size() * 2 + bytes / sizeof(wchar_t));
    }
}

std::optional<wxString> readRegistryText(HKEY root, const wxString& path, const wxString& name)
{
    RegistryKey key;
    wxString text;
    if (RegOpenKeyExW(root, path.wc_str(), 0, kReadNative, key.out()) != ERROR_SUCCESS ||
        queryRegistryText(key.get(), name.wc_str(), text) != ERROR_SUCCESS)
        return std::nullopt;
    return text;
}

std::vector<wxString> readRegistryTexts(HKEY root, const wxString& path, const wxString& name)
{
    std::vector<wxString> texts;
    RegistryKey key;
    if (RegOpenKeyExW(root, path.wc_str(), 0, kReadNative, key.out()) != ERROR_SUCCESS)
        return texts;
    DWORD bytes = 0;
    const auto query = [&](wchar_t* into) {
        return RegGetValueW(key.get(), nullptr, name.wc_str(), RRF_RT_REG_MULTI_SZ, nullptr, into, &bytes) ==
               ERROR_SUCCESS;
    };
    if (!query(nullptr))
        return texts;
    std::vector<wchar_t> buffer(bytes / sizeof(wchar_t) + 2);
    if (!query(buffer.data()))
        return texts;
    for (const wchar_t* at = buffer.data(); *at != L'\0'; at += texts.back().length() + 1)
        texts.emplace_back(at);
    return texts;
}

} // namespace tavi
