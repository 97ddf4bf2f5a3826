#include "Installation.h"

#include <windows.h>
#include <shlwapi.h>

#include <ctime>

#include "Database.h"
#include "History.h"
#include "StoredManifest.h"
#include "Text.h"

namespace service {
namespace {

constexpr wchar_t kInstallKey[] = L"Software\\Tavi";
constexpr wchar_t kSettingsKey[] = L"Software\\Tavi\\params";

void setText(const wchar_t* key, const wchar_t* value, const std::wstring& text)
{
    const auto bytes = static_cast<DWORD>((text.size() + 1) * sizeof(wchar_t));
    HKEY handle = nullptr;
    LONG result = RegCreateKeyExW(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, KEY_WRITE, nullptr, &handle, nullptr);
    if (result == ERROR_SUCCESS) {
        result = RegSetValueExW(handle, value, 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()), bytes);
        RegCloseKey(handle);
    }
    if (result != ERROR_SUCCESS)
        throw systemFailure(std::wstring(L"cannot write HKLM\\") + key, static_cast<DWORD>(result));
}

void makeFolder(const std::wstring& path)
{
    if (!CreateDirectoryW(path.c_str(), nullptr) && GetLastError() != ERROR_ALREADY_EXISTS)
        throw systemFailure(L"cannot make " + path, GetLastError());
}

void makeFolders(const std::wstring& path)
{
    const auto rest = static_cast<std::size_t>(PathSkipRootW(path.c_str()) - path.c_str());
    for (std::size_t end = rest; end != std::wstring::npos;) {
        end = path.find(L'\\', end + 1);
        makeFolder(path.substr(0, end));
    }
}

} // namespace

std::wstring Installation::configFolder() const
{
    return folder + L"\\config";
}

std::wstring Installation::dataFolder() const
{
    return folder + L"\\data";
}

std::wstring Installation::storeFolder() const
{
    return folder + L"\\store";
}

std::wstring Installation::configDatabase() const
{
    return configFolder() + L"\\taviconf.dat";
}

std::wstring Installation::stateDatabase() const
{
    return dataFolder() + L"\\tavistate.dat";
}

std::wstring Installation::historyDatabase() const
{
    return folder + L"\\history.dat";
}

Installation install(const std::wstring& folder)
{
    wchar_t full[MAX_PATH];
    const DWORD length = GetFullPathNameW(folder.c_str(), MAX_PATH, full, nullptr);
    if (length == 0 || length >= MAX_PATH || PathIsRootW(full))
        throw Failure{L"not a folder for the service: " + folder};
    PathRemoveBackslashW(full);
    const Installation made{full};
    for (const std::wstring& path : {made.folder, made.configFolder(), made.dataFolder(), made.storeFolder()})
        makeFolders(path);

    Database configuration(made.configDatabase());
    configuration.run("CREATE TABLE IF NOT EXISTS filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
    Database state(made.stateDatabase());
    state.run("CREATE TABLE IF NOT EXISTS manifest(contents BLOB);"
              "CREATE TABLE IF NOT EXISTS file_states(filename TEXT PRIMARY KEY, state INTEGER);"
              "CREATE TABLE IF NOT EXISTS restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT,"
              " encryption_key TEXT);"
              "CREATE TABLE IF NOT EXISTS restore_files(restore_id INTEGER, manifest_path TEXT, file_size INTEGER,"
              " timestamp INTEGER, ctime INTEGER, attributes INTEGER, target_path TEXT, overwrite INTEGER)");
    writeManifest(state, History(made).manifestText());

    setText(kInstallKey, L"ConfigPath", made.configFolder());
    setText(kInstallKey, L"DataPath", made.dataFolder());
    announceManifest();
    return made;
}

Installation findInstallation()
{
    wchar_t data[MAX_PATH] = L"";
    DWORD bytes = sizeof data;
    const LONG result =
        RegGetValueW(HKEY_LOCAL_MACHINE, kInstallKey, L"DataPath", RRF_RT_REG_SZ, nullptr, data, &bytes);
    if (result != ERROR_SUCCESS || !PathRemoveFileSpecW(data) ||
        !PathFileExistsW(Installation{data}.stateDatabase().c_str()))
        throw Failure{L"the service is not installed on this machine; see install"};
    return {data};
}

void announceManifest()
{
    // A reader compares whole seconds: one that loaded the former manifest within this second must still see a later
    // time.
    const std::time_t time = std::time(nullptr) + 1;
    wchar_t text[32];
    std::wcsftime(text, 32, L"%Y-%m-%d %H:%M:%S", std::localtime(&time));
    setText(kSettingsKey, L"options.manifestmtime", text);
}

} // namespace service
