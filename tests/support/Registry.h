#pragma once

#include <filesystem>
#include <string>

#include <windows.h>
#include <wx/msw/registry.h>

#include "core/InstallPaths.h"

namespace tavi::test {

// A fresh folder that is deleted with all that is in it.
class TemporaryFolder {
  public:
    TemporaryFolder()
    {
        static unsigned number = 0;
        path_ /= "tavi" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(number++);
        // A run that was ended left its folder behind, and the numbers of processes come again.
        std::filesystem::remove_all(path_);
        std::filesystem::create_directory(path_);
    }
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

// The service's install key with both directories in a folder of their own; gone again at the end.
class InstalledService {
  public:
    InstalledService()
    {
        install().Create();
        install().SetValue(L"ConfigPath", wxString(folder_.path()));
        install().SetValue(L"DataPath", wxString(folder_.path()));
    }
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

  private:
    TemporaryFolder folder_;
    wxRegKey install_{getInstallKeyName()};
};

} // namespace tavi::test
