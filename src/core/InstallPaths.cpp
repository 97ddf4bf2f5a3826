#include "core/InstallPaths.h"

#include <cstddef>

#include "core/LogLine.h"
#include "core/Registry.h"

namespace tavi {
namespace {

// Below HKEY_LOCAL_MACHINE.
constexpr const wchar_t* kInstallKey = L"Software\\Tavi";
constexpr const wchar_t* kSettingsKey = L"Software\\Tavi\\params";

const wchar_t* const kConfigFiles[] = {L"\\taviconf.dat", L"\\tavikey.dat"};
const wchar_t* const kDataFiles[] = {L"\\tavistate.dat",  L"\\tavi.log",      L"\\tavilog.dat", L"\\changes.dat",
                                     L"\\filter_raw.log", L"\\tavicache.dat", L"\\tavimap.dat", L""};

RegistryKey openKey(const wchar_t* path, REGSAM access) noexcept
{
    RegistryKey key;
    if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, path, 0, access | KEY_WOW64_32KEY, key.out()) != ERROR_SUCCESS)
        return {};
    return key;
}

// Logs the line that wxWidgets' own class for keys logs for a value that cannot be read.
void logUnreadable(const wchar_t* value, LSTATUS status) noexcept
{
    wchar_t reason[128] = L"";
    DWORD length = FormatMessageW(FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS, nullptr,
                                  static_cast<DWORD>(status), 0, reason, 128, nullptr);
    while (length > 0 && reason[length - 1] <= L' ')
        reason[--length] = L'\0';
    logError(L"Can't read value of 'HKLM\\%ls\\%ls' (error %ld: %ls)", kInstallKey, value, status, reason);
}

template <std::size_t kSize>
wxString filePath(const wchar_t* directoryValue, const wchar_t* const (&names)[kSize], std::size_t file)
{
    if (file >= kSize)
        return wxString();
    wxString directory;
    if (const RegistryKey key = openInstallKey(KEY_READ)) {
        if (const LSTATUS status = queryRegistryText(key.get(), directoryValue, directory); status != ERROR_SUCCESS)
            logUnreadable(directoryValue, status);
    }
    return directory + names[file];
}

} // namespace

wxString getInstallKeyName()
{
    return wxString(L"HKLM\\") + kInstallKey;
}

wxString getSettingsKeyName()
{
    return wxString(L"HKLM\\") + kSettingsKey;
}

RegistryKey openInstallKey(REGSAM access) noexcept
{
    return openKey(kInstallKey, access);
}

RegistryKey openSettingsKey(REGSAM access) noexcept
{
    return openKey(kSettingsKey, access);
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
