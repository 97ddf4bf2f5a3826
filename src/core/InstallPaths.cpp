#include "core/InstallPaths.h"

#include <cstddef>

#include <windows.h>
#include <wx/msw/registry.h>

namespace tavi {
namespace {

const wchar_t* const kConfigFiles[] = {L"\\taviconf.dat", L"\\tavikey.dat"};
const wchar_t* const kDataFiles[] = {L"\\tavistate.dat",  L"\\tavi.log",      L"\\tavilog.dat", L"\\changes.dat",
                                     L"\\filter_raw.log", L"\\tavicache.dat", L"\\tavimap.dat", L""};

template <std::size_t kSize>
wxString filePath(const wchar_t* directoryValue, const wchar_t* const (&names)[kSize], std::size_t file)
{
    if (file >= kSize)
        return wxString();
    wxString directory;
    const wxRegKey key = installKey();
    if (key.Exists() && !key.QueryValue(directoryValue, directory))
        directory.clear();
    return directory + names[file];
}

} // namespace

wxString getInstallKeyName()
{
    return L"HKLM\\Software\\Tavi";
}

wxString getSettingsKeyName()
{
    return getInstallKeyName() + L"\\params";
}

wxRegKey installKey()
{
    return {getInstallKeyName(), wxRegKey::WOW64ViewMode_32};
}

wxRegKey settingsKey()
{
    return {getSettingsKeyName(), wxRegKey::WOW64ViewMode_32};
}

wxString getConfigFilePath(ConfigFile file)
{
    return filePath(L"ConfigPath", kConfigFiles, static_cast<std::size_t>(file));
}

wxString getDataFilePath(DataFile file)
{
    return filePath(L"DataPath", kDataFiles, static_cast<std::size_t>(file));
}

} // namespace tavi
