#include <stdexcept>

#include <windows.h>
#include <sddl.h>

#include "exclusions/Graylist.h"
#include "core/Privileges.h"
#include "exclusions/UserProfiles.h"
#include "bench/Bench.h"
#include "bench/BenchInstall.h"
#include "core/Handles.h"

namespace tavi::bench {
namespace {

constexpr int kProfiles = 20;
constexpr const wchar_t* kProfileList = L"HKLM\\Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList\\";
constexpr const wchar_t* kShellFolders = L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders";

constexpr const wchar_t* kFolders[] = {L"Cookies",   L"History", L"Local Settings", L"Local AppData", L"NetHood",
                                       L"PrintHood", L"Recent",  L"Cache",          L"CD Burning"};

void makeFolders(const std::wstring& path)
{
    for (std::size_t end = path.find(L'\\'); end != std::wstring::npos;) {
        end = path.find(L'\\', end + 1);
        CreateDirectoryW(path.substr(0, end).c_str(), nullptr);
    }
}

// Users who are not logged on, each with folders of the usual names and a hive that names them.
class Profiles {
  public:
    explicit Profiles(const std::wstring& folder)
    {
        KernelHandle token;
        OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
        setPrivilege(token.get(), L"SeBackupPrivilege", true);
        for (int user = 0; user < kProfiles; ++user) {
            const std::wstring home = folder + L"\\user" + std::to_wstring(user);
            wxRegKey hive(L"HKCU\\Software\\TaviBenchHive");
            wxRegKey folders(hive, kShellFolders);
            folders.Create();
            for (const wchar_t* const name : kFolders) {
                const std::wstring path = home + L"\\AppData\\" + name;
                makeFolders(path + L"\\Microsoft\\Outlook");
                folders.SetValue(name, wxString(path));
            }
            RegistryKey saved;
            DeleteFileW((home + L"\\ntuser.dat").c_str());
            RegOpenKeyExW(HKEY_CURRENT_USER, L"Software\\TaviBenchHive", 0, KEY_READ, saved.out());
            if (RegSaveKeyW(saved.get(), (home + L"\\ntuser.dat").c_str(), nullptr) != ERROR_SUCCESS)
                throw std::runtime_error("no hive of a user");
            saved.reset();
            hive.DeleteSelf();

            const std::wstring sid = L"S-1-5-21-7-7-7-" + std::to_wstring(5000 + user);
            PSID binary = nullptr;
            ConvertStringSidToSidW(sid.c_str(), &binary);
            wxMemoryBuffer bytes;
            bytes.AppendData(binary, GetLengthSid(binary));
            LocalFree(binary);
            keys_.emplace_back(kProfileList + sid);
            wxRegKey profile(keys_.back());
            profile.Create();
            profile.SetValue(L"Sid", bytes);
            profile.SetValue(L"ProfileImagePath", wxString(home));
        }
        setPrivilege(token.get(), L"SeBackupPrivilege", false);
    }
    ~Profiles()
    {
        for (const wxString& key : keys_)
            wxRegKey(key).DeleteSelf();
    }
    Profiles(const Profiles&) = delete;
    Profiles& operator=(const Profiles&) = delete;

  private:
    std::vector<wxString> keys_;
};

// Files in the Windows folder itself, which every build lists.
class LargeWindowsFolder {
  public:
    explicit LargeWindowsFolder(unsigned files) : files_(files)
    {
        for (unsigned i = 0; i < files_; ++i)
            CloseHandle(CreateFileW(file(i).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr));
    }
    ~LargeWindowsFolder()
    {
        for (unsigned i = 0; i < files_; ++i)
            DeleteFileW(file(i).c_str());
    }
    LargeWindowsFolder(const LargeWindowsFolder&) = delete;
    LargeWindowsFolder& operator=(const LargeWindowsFolder&) = delete;
    static std::wstring folder()
    {
        wchar_t path[MAX_PATH] = L"";
        GetWindowsDirectoryW(path, MAX_PATH);
        return path;
    }

  private:
    static std::wstring file(unsigned i)
    {
        return folder() + L"\\tavibench" + std::to_wstring(i) + L".tmp";
    }
    unsigned files_;
};

unsigned count(const std::wstring& folder)
{
    unsigned entries = 0;
    WIN32_FIND_DATAW entry{};
    const HANDLE search = FindFirstFileW((folder + L"\\*").c_str(), &entry);
    for (BOOL more = search != INVALID_HANDLE_VALUE; more; more = FindNextFileW(search, &entry))
        ++entries;
    FindClose(search);
    return entries;
}

void runExclusions(Bench& bench)
{
    const BenchInstall service(bench.dataFolder() + "/exclusions-service");
    const wxString folder = fromUtf8(bench.dataFolder() + "/exclusions-users");
    wchar_t full[MAX_PATH];
    GetFullPathNameW(folder.wc_str(), MAX_PATH, full, nullptr);
    const Profiles profiles(full);
    const LargeWindowsFolder windows(bench.quick() ? 500 : 5000);
    buildGraylist(true);
    const double before = workingSet();
    // The system's share: hives, every user's folders by name, and a listing of each folder that has rules below it.
    const auto required = [&] {
        loadUserHives();
        for (const wchar_t* const name : kFolders)
            shellFolderPaths(name);
        unloadUserHives();
        count(LargeWindowsFolder::folder());
        for (int user = 0; user < kProfiles; ++user) {
            const std::wstring home = full + (L"\\user" + std::to_wstring(user));
            for (const wchar_t* const below :
                 {L"", L"\\AppData", L"\\AppData\\Local AppData", L"\\AppData\\Local AppData\\Microsoft"})
                count(home + below);
        }
    };
    const auto seconds = medianSeconds(bench.repetitions(), {[] { buildGraylist(true); }, required});
    bench.report({"exclusions: build, 20 profiles / the system calls it needs", seconds[0] / seconds[1], 2, ""});
    bench.report({"exclusions: build", seconds[0] * 1000, kNoBound, "ms"});
    bench.report({"exclusions: memory kept after rebuilding", (workingSet() - before) / 1048576, 1, "MB"});
    dropGraylist();
}

const Group group("exclusions", runExclusions);

} // namespace
} // namespace tavi::bench
