#include "ui/CopyTarget.h"

#include <algorithm>
#include <string>
#include <vector>

#include <commdlg.h>
#include <shlobj.h>
#include <shlwapi.h>
#include <wx/intl.h>

#include "core/Handles.h"

namespace tavi {
namespace {

constexpr std::size_t kFileNameChars = 8192;

} // namespace

wxString commonPrefix(const PathSet& paths)
{
    if (paths.empty())
        return wxString();
    auto path = paths.begin();
    wxString prefix = *path;
    while (++path != paths.end() && !prefix.empty()) {
        // Without a buffer the function returns the length alone; its buffer could not hold a long path. The length of
        // a bare drive includes the backslash.
        const int length = PathCommonPrefixW(prefix.wc_str(), path->wc_str(), nullptr);
        prefix.Truncate(static_cast<std::size_t>(std::max(length, 0)));
    }
    return prefix;
}

bool anyTargetExists(const PathSet& paths, const wxString& prefix, const wxString& folder)
{
    return std::any_of(paths.begin(), paths.end(), [&](const wxString& path) {
        const wxString target = folder + path.Mid(prefix.length());
        return GetFileAttributesW(target.wc_str()) != INVALID_FILE_ATTRIBUTES;
    });
}

std::optional<wxString> askFileName(HWND owner, const wxString& preset)
{
    std::vector<wchar_t> name(kFileNameChars);
    std::copy_n(preset.wc_str(), std::min(preset.length(), name.size() - 1), name.begin());
    std::wstring filter = _("All Files (*.*)").ToStdWstring();
    filter.append(1, L'\0').append(L"*.*").append(1, L'\0');
    const wxString title = _("Restore File As");

    OPENFILENAMEW box{};
    box.lStructSize = sizeof(box);
    box.hwndOwner = owner;
    box.lpstrFilter = filter.c_str();
    box.nFilterIndex = 1;
    box.lpstrFile = name.data();
    box.nMaxFile = static_cast<DWORD>(name.size());
    box.lpstrTitle = title.wc_str();
    box.Flags = OFN_OVERWRITEPROMPT | OFN_NOCHANGEDIR | OFN_EXPLORER | OFN_NODEREFERENCELINKS;
    if (!GetSaveFileNameW(&box))
        return std::nullopt;
    return wxString(name.data());
}

std::optional<wxString> askFolder(HWND owner)
{
    const wxString title = _("Select a folder to save your restored files in.");
    BROWSEINFOW box{};
    box.hwndOwner = owner;
    box.lpszTitle = title.wc_str();
    box.ulFlags = BIF_RETURNONLYFSDIRS | BIF_NEWDIALOGSTYLE;
    const ItemIdList chosen(SHBrowseForFolderW(&box));
    wchar_t path[MAX_PATH];
    if (!chosen || !SHGetPathFromIDListW(chosen.get(), path))
        return std::nullopt;
    PathAddBackslashW(path);
    return wxString(path);
}

} // namespace tavi
