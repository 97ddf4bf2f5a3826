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

namespace {

// For both kinds of programs, the shell gives a 32-bit process on a 64-bit Windows the folders of the 32-bit ones.
std::optional<wxString> foldersOf64BitPrograms(SpecialFolder folder)
{
    constexpr const wchar_t* kKey = L"Software\\Microsoft\\Windows\\CurrentVersion";
    BOOL isWow64 = FALSE;
    if (!IsWow64Process(GetCurrentProcess(), &isWow64) || !isWow64)
        return std::nullopt;
    switch (folder) {
    case SpecialFolder::programFiles:
        return readRegistryText(HKEY_LOCAL_MACHINE, kKey, L"ProgramFilesDir");
    case SpecialFolder::commonFiles:
        return readRegistryText(HKEY_LOCAL_MACHINE, kKey, L"CommonFilesDir");
    default:
        return std::nullopt;
    }
}

std::optional<wxString> specialFolder(SpecialFolder folder)
{
    if (auto other = foldersOf64BitPrograms(folder))
        return other;
    wchar_t path[MAX_PATH] = L"";
    if (!SHGetSpecialFolderPathW(nullptr, path, static_cast<int>(folder), FALSE))
        return std::nullopt;
    return path;
}

std::optional<wxString> temporaryFolder()
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

wxString windowsFolder()
{
    wchar_t path[MAX_PATH] = L"";
    GetWindowsDirectoryW(path, MAX_PATH);
    return path;
}

bool isFolder(const wxString& path)
{
    const DWORD attributes = GetFileAttributesW(path.wc_str());
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY);
}

} // namespace

ExclusionSources systemSources(FolderListings& listings)
{
    ExclusionSources sources;
    sources.mountPoints = [] { return volumeTable().mountPoints(); };
    sources.registryText = [](const wxString& key, const wxString& value) {
        return readRegistryText(HKEY_LOCAL_MACHINE, key, value);
    };
    sources.registryTexts = [](const wxString& key, const wxString& value) {
        return readRegistryTexts(HKEY_LOCAL_MACHINE, key, value);
    };
    sources.specialFolder = specialFolder;
    sources.temporaryFolder = temporaryFolder;
    sources.windowsFolder = windowsFolder;
    sources.dollarEntries = [&](const wxString& folder) { return listings.find(folder).dollarEntries; };
    sources.serviceDataFolder = [] { return getDataFilePath(DataFile::directory); };
    sources.userFolders = shellFolderPaths;
    sources.exists = isFolder;
    sources.keepsUserPlaces = [] { return readGraylistEnabled().value_or(false); };
    return sources;
}

} // namespace tavi
