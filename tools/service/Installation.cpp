#include "Installation.h"

#include <ctime>
#include <filesystem>

#include <windows.h>
#include <shlwapi.h>

#include "common/Handle.h"
#include "common/Text.h"
#include "Database.h"
#include "History.h"
#include "Manifest.h"

namespace service {
namespace {

constexpr wchar_t kInstallKey[] = L"Software\\Tavi";
constexpr wchar_t kSettingsKey[] = L"Software\\Tavi\\params";

// The service that this program stands in for is a 32-bit one, whose keys are in the 32-bit view.
constexpr REGSAM kRead = KEY_READ | KEY_WOW64_32KEY;
constexpr REGSAM kWrite = KEY_WRITE | KEY_WOW64_32KEY;

void setText(const wchar_t* key, const wchar_t* value, const std::wstring& text)
{
    const auto bytes = (static_cast<DWORD>(text.size()) + 1) * DWORD{sizeof(wchar_t)};
    HKEY opened = nullptr;
    LONG result = RegCreateKeyExW(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, kWrite, nullptr, &opened, nullptr);
    const tools::RegistryKey closing(opened);
    if (result == ERROR_SUCCESS)
        result = RegSetValueExW(opened, value, 0, REG_SZ, reinterpret_cast<const BYTE*>(text.c_str()), bytes);
    if (result != ERROR_SUCCESS)
        throw tools::systemFailure(std::wstring(L"cannot write HKLM\\") + key, static_cast<DWORD>(result));
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

std::wstring Installation::contentFile(const std::wstring& content) const
{
    return folder + L"\\store\\" + content;
}

void install(const std::wstring& folder)
{
    const Installation created{folder};
    for (const std::wstring& path : {created.configFolder(), created.dataFolder(), created.contentFile(L"")})
        std::filesystem::create_directories(path);

    Database configuration(created.configDatabase());
    configuration.run("CREATE TABLE IF NOT EXISTS filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
    Database state(created.stateDatabase());
    state.run("CREATE TABLE IF NOT EXISTS manifest(contents BLOB);"
              "CREATE TABLE IF NOT EXISTS file_states(filename TEXT PRIMARY KEY, state INTEGER);"
              "CREATE TABLE IF NOT EXISTS restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT,"
              " encryption_key TEXT);"
              "CREATE TABLE IF NOT EXISTS restore_files(restore_id INTEGER, manifest_path TEXT, file_size INTEGER,"
              " timestamp INTEGER, ctime INTEGER, attributes INTEGER, target_path TEXT, overwrite INTEGER)");
    setText(kInstallKey, L"ConfigPath", created.configFolder());
    setText(kInstallKey, L"DataPath", created.dataFolder());
    History history(created);
    publishManifest(created, history);
}

Installation findInstallation()
{
    wchar_t data[MAX_PATH] = L"";
    DWORD bytes = sizeof data;
    HKEY opened = nullptr;
    LONG result = RegOpenKeyExW(HKEY_LOCAL_MACHINE, kInstallKey, 0, kRead, &opened);
    const tools::RegistryKey closing(opened);
    if (result == ERROR_SUCCESS)
        result = RegGetValueW(opened, nullptr, L"DataPath", RRF_RT_REG_SZ, nullptr, data, &bytes);
    if (result != ERROR_SUCCESS || !PathRemoveFileSpecW(data))
        throw tools::Failure{L"the service is not installed on this machine"};
    return {data};
}

void announceManifest()
{
    // The shell extension compares whole seconds. If it loaded the former manifest within this second, it must still
    // see a later time.
    const std::time_t time = std::time(nullptr) + 1;
    wchar_t text[32];
    std::wcsftime(text, 32, L"%Y-%m-%d %H:%M:%S", std::localtime(&time));
    setText(kSettingsKey, L"options.manifestmtime", text);
}

} // namespace service
