#pragma once

#include <filesystem>
#include <stdexcept>
#include <string>
#include <string_view>

#include <windows.h>
// wxWidgets' header of the registry needs the one before it.
// clang-format off
#include <wx/string.h>
#include <wx/msw/registry.h>
// clang-format on
#include <sqlite3.h>

#include "core/InstallPaths.h"
#include "core/Utf8.h"
#include "statedb/Database.h"

// The service's files and keys, for benchmarks and tests.
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
    wxRegKey install_{getInstallKeyName(), wxRegKey::WOW64ViewMode_32};
};

} // namespace test
} // namespace tavi
