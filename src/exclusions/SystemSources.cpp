#include "exclusions/SystemSources.h"

#include <windows.h>
#include <shlobj.h>
#include <wx/filename.h>

#include "core/InstallPaths.h"
#include "core/Options.h"
#include "core/Registry.h"
#include "exclusions/UserProfiles.h"
#include "exclusions/Volumes.h"

namespace tavi {

std::set<wxString> SystemSources::mountPoints()
{
    return volumeTable().mountPoints();
}

std::optional<wxString> SystemSources::registryText(const wxString& key, const wxString& value)
{
    return readRegistryText(HKEY_LOCAL_MACHINE, key, value);
}

std::vector<wxString> SystemSources::registryTexts(const wxString& key, const wxString& value)
{
    return readRegistryTexts(HKEY_LOCAL_MACHINE, key, value);
}

std::optional<wxString> SystemSources::specialFolder(int number)
{
    wchar_t path[MAX_PATH] = L"";
    return SHGetSpecialFolderPathW(nullptr, path, number, FALSE) ? std::optional<wxString>(path) : std::nullopt;
}

std::optional<wxString> SystemSources::temporaryFolder()
{
    const DWORD size = GetEnvironmentVariableW(L"TEMP", nullptr, 0);
    std::vector<wchar_t> text(size + 1);
    if (size == 0 || GetEnvironmentVariableW(L"TEMP", text.data(), size) == 0)
        return std::nullopt;
    wxFileName path(text.data());
    path.Normalize(wxPATH_NORM_ENV_VARS | wxPATH_NORM_DOTS | wxPATH_NORM_TILDE | wxPATH_NORM_ABSOLUTE |
                   wxPATH_NORM_LONG | wxPATH_NORM_SHORTCUT);
    return path.GetFullPath();
}

wxString SystemSources::windowsFolder()
{
    wchar_t path[MAX_PATH] = L"";
    GetWindowsDirectoryW(path, MAX_PATH);
    return path;
}

std::vector<wxString> SystemSources::dollarEntries(const wxString& folder)
{
    return listings_.of(folder).dollarEntries;
}

wxString SystemSources::serviceDataFolder()
{
    return getDataFilePath(kDataDirectory);
}

std::vector<wxString> SystemSources::userFolders(const wxString& name)
{
    return shellFolderPaths(name);
}

bool SystemSources::exists(const wxString& folder)
{
    const DWORD attributes = GetFileAttributesW(folder.wc_str());
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY);
}

bool SystemSources::keepsUserPlaces()
{
    return readGraylistEnabled().value_or(false);
}

} // namespace tavi
