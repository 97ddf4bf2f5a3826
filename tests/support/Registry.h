#pragma once

#include <filesystem>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>

#include <windows.h>
#include <sqlite3.h>
#include <wx/msw/registry.h>

#include "core/Handles.h"
#include "core/InstallPaths.h"
#include "core/Utf8.h"
#include "exclusions/Privileges.h"
#include "statedb/Database.h"

namespace tavi {

// The two keys, in the view that the module reads.
inline wxRegKey installKey()
{
    return {getInstallKeyName(), wxRegKey::WOW64ViewMode_32};
}
inline wxRegKey settingsKey()
{
    return {getSettingsKeyName(), wxRegKey::WOW64ViewMode_32};
}

} // namespace tavi

namespace tavi::test {

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
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;
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
        sqlite3* database = nullptr;
        sqlite3_stmt* insert = nullptr;
        const bool stored =
            sqlite3_open(toUtf8(file(L"tavistate.dat")).c_str(), &database) == SQLITE_OK &&
            sqlite3_prepare_v2(database, "INSERT INTO manifest VALUES(?)", -1, &insert, nullptr) == SQLITE_OK &&
            sqlite3_bind_blob(insert, 1, blob.data(), static_cast<int>(blob.size()), SQLITE_STATIC) == SQLITE_OK &&
            sqlite3_step(insert) == SQLITE_DONE;
        sqlite3_finalize(insert);
        sqlite3_close(database);
        if (!stored)
            throw std::runtime_error("cannot store the manifest");
    }

  private:
    TemporaryFolder folder_;
    wxRegKey install_ = installKey();
};

inline KernelHandle processToken()
{
    KernelHandle token;
    OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
    return token;
}

// A user who is not logged on: a profile and a saved hive that maps the names of shell folders to their paths.
struct AbsentUser {
    AbsentUser(const std::map<std::wstring, std::wstring>& shellFolders)
    {
        wxRegKey source(L"HKCU\\Software\\TaviTestHive");
        wxRegKey folders(source, L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders");
        folders.Create();
        for (const auto& [name, path] : shellFolders)
            folders.SetValue(name, wxString(path));
        const KernelHandle token = processToken();
        setPrivilege(token.get(), L"SeBackupPrivilege", true);
        RegistryKey key;
        RegOpenKeyExW(HKEY_CURRENT_USER, L"Software\\TaviTestHive", 0, KEY_READ, key.out());
        if (RegSaveKeyW(key.get(), hiveFile.c_str(), nullptr) != ERROR_SUCCESS)
            throw std::runtime_error("cannot save the hive of a user");
        setPrivilege(token.get(), L"SeBackupPrivilege", false);
        source.DeleteSelf();

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

} // namespace tavi::test
