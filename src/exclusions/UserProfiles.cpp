#include "exclusions/UserProfiles.h"

#include <map>
#include <string>

#include <windows.h>
#include <sddl.h>

#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/Registry.h"
#include "exclusions/Privileges.h"

namespace tavi {
namespace {

constexpr const wchar_t* kProfileList = L"Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList";
constexpr const wchar_t* kShellFolders = L"\\Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders";
constexpr DWORD kMaxSidBytes = 1024;

int loadNesting = 0;
// Never reset: each load of a hive gets a new name.
int hiveCounter = 0;
std::vector<wxString> loadedHives;
// The user's SID of each temporary hive. Only for a debugger.
std::map<wxString, wxString> hiveOwners;

// Enables the two privileges that loading needs, and restores them on destruction.
class HivePrivileges {
  public:
    HivePrivileges() noexcept
    {
        if (!OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token_.out()))
            return;
        for (std::size_t i = 0; i < kCount; ++i) {
            if (isPrivilegeEnabled(token_.get(), kNames[i]))
                continue;
            enabledHere_[i] = setPrivilege(token_.get(), kNames[i], true);
            if (!enabledHere_[i])
                return;
        }
        held_ = true;
    }
    HivePrivileges(const HivePrivileges&) = delete;
    HivePrivileges& operator=(const HivePrivileges&) = delete;
    ~HivePrivileges()
    {
        for (std::size_t i = 0; i < kCount; ++i) {
            if (enabledHere_[i])
                setPrivilege(token_.get(), kNames[i], false);
        }
    }
    bool held() const noexcept
    {
        return held_;
    }

  private:
    static constexpr std::size_t kCount = 2;
    static constexpr const wchar_t* kNames[kCount] = {L"SeBackupPrivilege", L"SeRestorePrivilege"};
    KernelHandle token_;
    bool enabledHere_[kCount] = {};
    bool held_ = false;
};

// Returns the names of all sub-keys. All are read first, since loading a hive changes the enumeration.
std::vector<wxString> subKeys(HKEY key)
{
    std::vector<wxString> names;
    wchar_t name[256];
    for (DWORD index = 0;; ++index) {
        DWORD length = 256;
        const LONG result = RegEnumKeyExW(key, index, name, &length, nullptr, nullptr, nullptr, nullptr);
        if (result == ERROR_SUCCESS)
            names.emplace_back(name, length);
        else if (result != ERROR_MORE_DATA)
            return names;
    }
}

bool readOwner(const wxString& profile, wxString& owner)
{
    RegistryKey key;
    BYTE sid[kMaxSidBytes];
    DWORD size = sizeof(sid);
    if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, profile.wc_str(), 0, kReadNative, key.out()) != ERROR_SUCCESS ||
        RegQueryValueExW(key.get(), L"Sid", nullptr, nullptr, sid, &size) != ERROR_SUCCESS || !IsValidSid(sid))
        return false;
    LocalText text;
    if (!ConvertSidToStringSidW(sid, text.out()))
        return false;
    owner = text.get();
    return true;
}

void loadHive(const wxString& profile)
{
    wxString owner;
    const auto image = readRegistryText(HKEY_LOCAL_MACHINE, profile, L"ProfileImagePath");
    if (!image || !readOwner(profile, owner))
        return;
    const wxString file = *image + L"\\ntuser.dat";
    if (GetFileAttributesW(file.wc_str()) == INVALID_FILE_ATTRIBUTES)
        return;
    // wxString::Format() would end the process if memory runs out.
    const wxString name(L"tavi" + std::to_wstring(hiveCounter));
    // Recorded before the load: if memory ran out after it, the hive would never be unloaded.
    loadedHives.push_back(name);
    // Fails for a user who is logged on, whose hive the system has already loaded.
    if (RegLoadKeyW(HKEY_USERS, name.wc_str(), file.wc_str()) != ERROR_SUCCESS) {
        loadedHives.pop_back();
        return;
    }
    ++hiveCounter;
    hiveOwners[L"HKEY_USERS\\" + name] = owner;
}

} // namespace

void loadUserHives()
{
    if (++loadNesting != 1)
        return;
    try {
        const HivePrivileges privileges;
        if (!privileges.held())
            return;
        RegistryKey profiles;
        if (RegOpenKeyExW(HKEY_LOCAL_MACHINE, kProfileList, 0, kReadNative, profiles.out()) != ERROR_SUCCESS)
            return;
        for (const wxString& profile : subKeys(profiles.get()))
            loadHive(wxString(kProfileList) + L"\\" + profile);
    } catch (...) {
        unloadUserHives();
        throw;
    }
}

void unloadUserHives() noexcept
{
    if (--loadNesting != 0)
        return;
    const HivePrivileges privileges;
    // The hives stay loaded and recorded.
    if (!privileges.held())
        return;
    for (const wxString& name : loadedHives) {
        if (const LONG code = RegUnLoadKeyW(HKEY_USERS, name.wc_str()); code != ERROR_SUCCESS)
            logError(L"Unable to unload temp reg hive %ls: %ld", name.wc_str(), code);
    }
    loadedHives.clear();
    hiveOwners.clear();
}

wxString longPath(const wxString& path)
{
    std::vector<wchar_t> buffer(path.length() + 1);
    DWORD length = 0;
    // Repeated after growing; a path that changes meanwhile may need more.
    while ((length = GetLongPathNameW(path.wc_str(), buffer.data(), static_cast<DWORD>(buffer.size()))) >=
           buffer.size())
        buffer.resize(length + 1);
    if (length >= 2 && buffer[1] == L':' && buffer[0] >= L'a' && buffer[0] <= L'z')
        buffer[0] = static_cast<wchar_t>(buffer[0] - L'a' + L'A');
    return wxString(buffer.data(), length);
}

std::vector<wxString> shellFolderPaths(const wxString& valueName)
{
    std::vector<wxString> paths;
    // Not opened: that would return the predefined key itself, which a close would close for the whole host.
    for (const wxString& user : subKeys(HKEY_USERS)) {
        const auto value = readRegistryText(HKEY_USERS, user + kShellFolders, valueName);
        const wxString path = value ? longPath(*value) : wxString();
        if (path.length() >= 3)
            paths.push_back(path);
    }
    return paths;
}

} // namespace tavi
