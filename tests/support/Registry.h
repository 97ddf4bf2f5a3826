#pragma once

#include <filesystem>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include <windows.h>
#include <wx/msw/registry.h>

#include "core/Handles.h"
#include "core/InstallPaths.h"
#include "exclusions/Privileges.h"
#include "statedb/Database.h"

namespace tavi {

// In the view that the module reads.
inline wxRegKey settingsKey()
{
    return {getSettingsKeyName(), wxRegKey::WOW64ViewMode_32};
}

namespace test {

// A new folder, which is deleted with its content.
class TemporaryFolder {
  public:
    TemporaryFolder()
    {
        static unsigned number = 0;
        path_ /= "tavi" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(number++);
        // A killed run leaves its folder behind, and Windows uses process ids again.
        std::filesystem::remove_all(path_);
        std::filesystem::create_directory(path_);
    }
    TemporaryFolder(TemporaryFolder&&) = delete;
    ~TemporaryFolder()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    const std::wstring& path() const
    {
        return path_.native();
    }

  private:
    std::filesystem::path path_ = std::filesystem::temp_directory_path();
};

// The service's install key, which names one temporary folder for both kinds of files. The destructor deletes the key.
class InstalledService {
  public:
    InstalledService()
    {
        install_.Create();
        install_.SetValue(L"ConfigPath", wxString(folder_.path()));
        install_.SetValue(L"DataPath", wxString(folder_.path()));
    }
    ~InstalledService()
    {
        install_.DeleteSelf();
    }
    wxRegKey& install()
    {
        return install_;
    }
    std::wstring file(const wchar_t* name) const
    {
        return folder_.path() + L"\\" + name;
    }
    DbConnection database(const wchar_t* name) const
    {
        DbConnection database;
        database.open(file(name));
        return database;
    }

    // Creates all tables that the module reads or writes.
    void createTables() const
    {
        database(L"taviconf.dat").execDML("CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
        database(L"tavistate.dat")
            .execDML("CREATE TABLE manifest(contents BLOB);"
                     "CREATE TABLE file_states(filename TEXT PRIMARY KEY, state INTEGER);"
                     "CREATE TABLE restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT, "
                     "encryption_key TEXT);"
                     "CREATE TABLE restore_files(restore_id INTEGER, manifest_path TEXT, file_size INTEGER, timestamp "
                     "INTEGER, ctime INTEGER, attributes INTEGER, target_path TEXT, overwrite INTEGER)");
    }
    // Stores a compressed manifest text.
    void storeManifest(std::string_view blob) const
    {
        std::string hex;
        for (const char byte : blob)
            (hex += "0123456789ABCDEF"[byte >> 4 & 15]) += "0123456789ABCDEF"[byte & 15];
        database(L"tavistate.dat").execDML(("INSERT INTO manifest VALUES(x'" + hex + "')").c_str());
    }

  private:
    TemporaryFolder folder_;
    wxRegKey install_{getInstallKeyName(), wxRegKey::WOW64ViewMode_32};
};

inline KernelHandle processToken()
{
    KernelHandle token;
    OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
    return token;
}

// Returns the hives that the module has loaded.
inline std::vector<std::wstring> temporaryHives()
{
    std::vector<std::wstring> names;
    wchar_t name[256];
    for (DWORD index = 0; RegEnumKeyW(HKEY_USERS, index, name, 256) == ERROR_SUCCESS; ++index) {
        if (std::wstring_view(name).substr(0, 4) == L"tavi")
            names.emplace_back(name);
    }
    return names;
}

// A user who is not logged on: a profile and a saved hive that maps the names of shell folders to their paths.
struct AbsentUser {
    AbsentUser(const std::map<std::wstring, std::wstring>& shellFolders)
    {
        RegistryKey source;
        RegCreateKeyW(HKEY_CURRENT_USER, L"Software\\TaviTestHive", source.out());
        for (const auto& [name, path] : shellFolders)
            RegSetKeyValueW(source.get(), L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders",
                            name.c_str(), REG_SZ, path.c_str(), DWORD((path.size() + 1) * sizeof(wchar_t)));
        const KernelHandle token = processToken();
        setPrivilege(token.get(), L"SeBackupPrivilege", true);
        if (RegSaveKeyW(source.get(), hiveFile.c_str(), nullptr) != ERROR_SUCCESS)
            throw std::runtime_error("cannot save the hive of a user");
        setPrivilege(token.get(), L"SeBackupPrivilege", false);
        RegDeleteTreeW(HKEY_CURRENT_USER, L"Software\\TaviTestHive");

        const SID sid = {SID_REVISION, 1, SECURITY_NT_AUTHORITY, {SECURITY_LOCAL_SERVICE_RID}};
        wxMemoryBuffer bytes;
        bytes.AppendData(&sid, sizeof(sid));
        profile.Create();
        profile.SetValue(L"Sid", bytes);
        profile.SetValue(L"ProfileImagePath", wxString(folder.path()));
    }
    ~AbsentUser()
    {
        profile.DeleteSelf();
    }
    const TemporaryFolder folder;
    const std::wstring hiveFile = folder.path() + L"\\ntuser.dat";
    // The number of the next user. A later run overwrites the keys that a killed run leaves behind.
    static inline int users = 4000;
    wxRegKey profile{L"HKLM\\Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList\\S-1-5-21-1-2-3-" +
                     std::to_wstring(users++)};
};

} // namespace test
} // namespace tavi
