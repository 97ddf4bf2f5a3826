#pragma once

#include <string>

#include <windows.h>
#include <wx/string.h>
#include <wx/msw/registry.h>

#include "core/InstallPaths.h"
#include "core/Utf8.h"
#include "statedb/Database.h"

namespace tavi::bench {

// An installed service whose databases stand in one folder, for as long as this lives.
class BenchInstall {
  public:
    explicit BenchInstall(const std::string& folder) : folder_(fromUtf8(folder)), key_(getInstallKeyName())
    {
        CreateDirectoryW(folder_.wc_str(), nullptr);
        key_.Create();
        key_.SetValue(L"ConfigPath", folder_);
        key_.SetValue(L"DataPath", folder_);
        for (const int file : {0, 1})
            DeleteFileW((file == 0 ? getConfigFilePath(kConfigDatabase) : getDataFilePath(kStateDatabase)).wc_str());
    }
    BenchInstall(const BenchInstall&) = delete;
    BenchInstall& operator=(const BenchInstall&) = delete;
    ~BenchInstall()
    {
        key_.DeleteSelf();
    }
    DbConnection stateDatabase() const
    {
        return open(getDataFilePath(kStateDatabase));
    }
    DbConnection configDatabase() const
    {
        return open(getConfigFilePath(kConfigDatabase));
    }

  private:
    static DbConnection open(const wxString& path)
    {
        DbConnection database;
        database.open(path);
        return database;
    }

    wxString folder_;
    wxRegKey key_;
};

} // namespace tavi::bench
