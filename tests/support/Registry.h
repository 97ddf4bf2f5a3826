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
#include "core/Privileges.h"
#include "core/Utf8.h"
#include "statedb/Database.h"

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
        install().Create();
        install().SetValue(L"ConfigPath", wxString(folder_.path()));
        install().SetValue(L"DataPath", wxString(folder_.path()));
    }
    InstalledService(const InstalledService&) = delete;
    InstalledService& operator=(const InstalledService&) = delete;
    ~InstalledService()
    {
        install().DeleteSelf();
    }
    wxRegKey& install()
    {
        return install_;
    }
    std::wstring file(const wchar_t* name) const
    {
        return folder_.path() + L"\\" + name;
    }
    // Opens one of the service's databases.
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
    wxRegKey install_{getInstallKeyName()};
};

// A user who is not logged on: a profile and a saved hive that names shell folders.
class AbsentUser {
  public:
    AbsentUser(const wchar_t* shellFolder, const std::wstring& path)
        : AbsentUser(std::map<std::wstring, std::wstring>{{shellFolder, path}})
    {
    }
    // The keys are the names of the shell folders, the values their paths.
    explicit AbsentUser(const std::map<std::wstring, std::wstring>& shellFolders)
    {
        wxRegKey source(L"HKCU\\Software\\TaviTestHive");
        wxRegKey folders(source, L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders");
        folders.Create();
        for (const auto& [name, path] : shellFolders)
            folders.SetValue(name, wxString(path));
        saveHive();
        source.DeleteSelf();

        const SID sid = {SID_REVISION, 1, SECURITY_NT_AUTHORITY, {SECURITY_LOCAL_SERVICE_RID}};
        wxMemoryBuffer bytes;
        bytes.AppendData(&sid, sizeof(sid));
        profile_.Create();
        profile_.SetValue(L"Sid", bytes);
        profile_.SetValue(L"ProfileImagePath", wxString(folder_.path()));
    }
    AbsentUser(const AbsentUser&) = delete;
    AbsentUser& operator=(const AbsentUser&) = delete;
    ~AbsentUser()
    {
        profile_.DeleteSelf();
        --users_;
    }
    std::wstring hiveFile() const
    {
        return folder_.path() + L"\\ntuser.dat";
    }

  private:
    void saveHive() const
    {
        KernelHandle token;
        OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
        RegistryKey key;
        RegOpenKeyExW(HKEY_CURRENT_USER, L"Software\\TaviTestHive", 0, KEY_READ, key.out());
        setPrivilege(token.get(), L"SeBackupPrivilege", true);
        const LSTATUS status = RegSaveKeyW(key.get(), hiveFile().c_str(), nullptr);
        setPrivilege(token.get(), L"SeBackupPrivilege", false);
        if (status != ERROR_SUCCESS)
            throw std::runtime_error("cannot save the hive of a user");
    }

    TemporaryFolder folder_;
    // The number of the next user. A later run overwrites the keys that a killed run leaves behind.
    static inline int users_ = 4000;
    wxRegKey profile_{L"HKLM\\Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList\\S-1-5-21-1-2-3-" +
                      std::to_wstring(users_++)};
};

} // namespace tavi::test
