#pragma once

#include <string>

#include <windows.h>
#include <wx/msw/registry.h>

#include "core/InstallPaths.h"

namespace tavi::test {

// A fresh folder that is deleted, with its files, at the end.
class TemporaryFolder {
  public:
    TemporaryFolder()
    {
        static unsigned number = 0;
        wchar_t base[MAX_PATH];
        GetTempPathW(MAX_PATH, base);
        path_ = base + (L"tavi" + std::to_wstring(GetCurrentProcessId()) + L"-" + std::to_wstring(number++));
        CreateDirectoryW(path_.c_str(), nullptr);
    }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;
    ~TemporaryFolder()
    {
        remove(path_);
    }
    const std::wstring& path() const
    {
        return path_;
    }

  private:
    static void remove(const std::wstring& folder)
    {
        WIN32_FIND_DATAW found;
        const HANDLE find = FindFirstFileW((folder + L"\\*").c_str(), &found);
        if (find != INVALID_HANDLE_VALUE) {
            do {
                const std::wstring name = found.cFileName;
                const std::wstring path = folder + L"\\" + name;
                if (name == L"." || name == L"..")
                    continue;
                if (found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
                    remove(path);
                else
                    DeleteFileW(path.c_str());
            } while (FindNextFileW(find, &found));
            FindClose(find);
        }
        RemoveDirectoryW(folder.c_str());
    }

    std::wstring path_;
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
    wxRegKey install_{GetInstallKeyName()};
};

} // namespace tavi::test
