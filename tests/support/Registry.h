#pragma once

#include <map>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include <windows.h>
#include <wx/msw/registry.h>

#include "bench/InstalledService.h"
#include "core/Handles.h"
#include "exclusions/Privileges.h"

namespace tavi::test {

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

} // namespace tavi::test
