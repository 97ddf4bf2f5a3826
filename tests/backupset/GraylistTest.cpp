#include "backupset/Graylist.h"

#include <algorithm>
#include <cwchar>

#include <windows.h>
#include <sddl.h>

#include <gtest/gtest.h>

#include "backupset/ManifestWatcher.h"
#include "backupset/UserProfiles.h"
#include "backupset/Volumes.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "tests/support/Counts.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

bool privilegeIsOn(const wchar_t* name)
{
    KernelHandle token;
    OpenProcessToken(GetCurrentProcess(), TOKEN_QUERY, token.out());
    return IsPrivilegeEnabled(token.get(), name);
}

// A user who is not logged on: a profile with a hive that names its shell folders.
class AbsentUser {
  public:
    AbsentUser(const wchar_t* sid, const wchar_t* shellFolder, const std::wstring& path)
        : profile_(wxString(L"HKLM\\Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList\\") + sid)
    {
        wxRegKey source(L"HKCU\\Software\\TaviTestHive");
        wxRegKey(source, L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders").Create();
        wxRegKey folders(source, L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders");
        folders.SetValue(shellFolder, wxString(path));
        KernelHandle token;
        OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
        SetPrivilege(token.get(), L"SeBackupPrivilege", true);
        RegistryKey hive;
        RegOpenKeyExW(HKEY_CURRENT_USER, L"Software\\TaviTestHive", 0, KEY_READ, hive.out());
        EXPECT_EQ(RegSaveKeyW(hive.get(), (folder_.path() + L"\\ntuser.dat").c_str(), nullptr), ERROR_SUCCESS);
        SetPrivilege(token.get(), L"SeBackupPrivilege", false);
        hive.reset();
        source.DeleteSelf();

        PSID binary = nullptr;
        ConvertStringSidToSidW(sid, &binary);
        wxMemoryBuffer bytes;
        bytes.AppendData(binary, GetLengthSid(binary));
        LocalFree(binary);
        profile_.Create();
        profile_.SetValue(L"Sid", bytes);
        profile_.SetValue(L"ProfileImagePath", wxString(folder_.path()));
    }
    ~AbsentUser()
    {
        profile_.DeleteSelf();
    }
    void loseHive() const
    {
        DeleteFileW((folder_.path() + L"\\ntuser.dat").c_str());
    }

  private:
    TemporaryFolder folder_;
    wxRegKey profile_;
};

std::vector<std::wstring> temporaryHives()
{
    std::vector<std::wstring> names;
    wchar_t name[256];
    for (DWORD index = 0; RegEnumKeyW(HKEY_USERS, index, name, 256) == ERROR_SUCCESS; ++index) {
        if (std::wcsncmp(name, L"tavi", 4) == 0)
            names.emplace_back(name);
    }
    return names;
}

TEST(UserProfiles, LoadsTheHivesOfAbsentUsersAndUnloadsThemAgain)
{
    LogCapture log;
    const TemporaryFolder cookies;
    const AbsentUser first(L"S-1-5-21-1-2-3-4001", L"Cookies", cookies.path()),
        second(L"S-1-5-21-1-2-3-4002", L"Cookies", cookies.path() + L"\\missing"),
        third(L"S-1-5-21-1-2-3-4003", L"Cookies", cookies.path());
    second.loseHive();
    const auto count = [&] {
        const auto paths = ShellFolderPaths(L"Cookies");
        return std::count(paths.begin(), paths.end(), LongPath(cookies.path()));
    };
    EXPECT_EQ(count(), 0);
    std::vector<std::wstring> names;
    for (int round = 0; round < 2; ++round) {
        LoadUserHives();
        const auto loaded = temporaryHives();
        EXPECT_EQ(loaded.size(), 2u);
        EXPECT_NE(loaded, names) << "a name is used once";
        names = loaded;
        LoadUserHives();
        UnloadUserHives();
        EXPECT_EQ(temporaryHives(), loaded) << "a nested pair does nothing";
        EXPECT_EQ(count(), 2);
        EXPECT_FALSE(privilegeIsOn(L"SeBackupPrivilege") || privilegeIsOn(L"SeRestorePrivilege"));
        if (round == 1) {
            KernelHandle token;
            OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
            SetPrivilege(token.get(), L"SeRestorePrivilege", true);
            EXPECT_EQ(RegUnLoadKeyW(HKEY_USERS, loaded[0].c_str()), ERROR_SUCCESS);
            UnloadUserHives();
            EXPECT_TRUE(privilegeIsOn(L"SeRestorePrivilege")) << "left as it was found";
            SetPrivilege(token.get(), L"SeRestorePrivilege", false);
            EXPECT_EQ(log.take(), std::vector<std::string>{"1: Error: Unable to unload temp reg hive " +
                                                           wxString(loaded[0]).utf8_string() + ": 2"});
        } else {
            UnloadUserHives();
            EXPECT_EQ(log.take(), std::vector<std::string>());
        }
        EXPECT_TRUE(temporaryHives().empty());
    }

    wchar_t shortPath[MAX_PATH];
    GetShortPathNameW(cookies.path().c_str(), shortPath, MAX_PATH);
    shortPath[0] = L'c';
    EXPECT_TRUE(LongPath(shortPath).IsSameAs(cookies.path(), false));
    EXPECT_EQ(LongPath(shortPath)[0], L'C');
    EXPECT_EQ(LongPath(cookies.path() + L"\\missing"), L"");
}

// The system under Wine calls every volume's drive type unknown, has no folder mounts and no links between devices:
// each of these stands here as the system's documentation has it.
namespace fake {

int volume;
DWORD failing;

HANDLE WINAPI findFirst(LPWSTR name, DWORD)
{
    std::wcscpy(name, L"\\\\?\\Volume{0}\\");
    volume = 0;
    return GetProcessHeap();
}
BOOL WINAPI findNext(HANDLE, LPWSTR name, DWORD)
{
    std::swprintf(name, 50, L"\\\\?\\Volume{%d}\\", ++volume);
    return volume < 4;
}
BOOL WINAPI findClose(HANDLE)
{
    return TRUE;
}
DWORD WINAPI queryDevice(LPCWSTR name, LPWSTR target, DWORD)
{
    return static_cast<DWORD>(std::swprintf(target, 50, L"\\Device\\%ls", name));
}
UINT WINAPI driveType(LPCWSTR name)
{
    return std::wcscmp(name, L"\\\\?\\Volume{2}\\") == 0 ? DRIVE_REMOVABLE : DRIVE_FIXED;
}
UINT WINAPI alwaysFixed(LPCWSTR)
{
    return DRIVE_FIXED;
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    // Volume 1 is mounted twice, volume 3 cannot tell.
    const std::wstring all = volume == 1 ? std::wstring(L"D:\\\0C:\\mount\\\0", 14) : std::wstring(L"C:\\\0", 5);
    *length = static_cast<DWORD>(all.size());
    if (volume == 3 || size < all.size()) {
        SetLastError(volume == 3 ? failing : DWORD{ERROR_MORE_DATA});
        return volume == 3 && failing == 0;
    }
    std::copy(all.begin(), all.end(), paths);
    return TRUE;
}
NTSTATUS NTAPI openLink(HANDLE* link, ACCESS_MASK access, OBJECT_ATTRIBUTES* attributes)
{
    EXPECT_EQ(access, GENERIC_READ);
    EXPECT_EQ(attributes->Attributes, 0x40u);
    *link = GetProcessHeap();
    const std::wstring name(attributes->ObjectName->Buffer, attributes->ObjectName->Length / sizeof(wchar_t));
    return name == L"\\Device\\Volume{1}" ? 0 : static_cast<NTSTATUS>(0xC0000024);
}
NTSTATUS NTAPI queryLink(HANDLE, UNICODE_STRING* target, ULONG* bytes)
{
    const std::wstring name = L"\\Device\\Disk7";
    *bytes = static_cast<ULONG>(name.size() * sizeof(wchar_t));
    if (target->MaximumLength < *bytes)
        return static_cast<NTSTATUS>(0xC0000023);
    std::copy(name.begin(), name.end(), target->Buffer);
    target->Length = static_cast<USHORT>(*bytes);
    return 0;
}
NTSTATUS NTAPI closeLink(HANDLE)
{
    return 0;
}

} // namespace fake

TEST(Volumes, AreTheMountPointsOfFixedVolumes)
{
    LogCapture log;
    VolumeFunctions functions;
    functions.findFirst = fake::findFirst;
    functions.findNext = fake::findNext;
    functions.findClose = fake::findClose;
    functions.queryDevice = fake::queryDevice;
    functions.driveType = fake::driveType;
    functions.pathNames = fake::pathNames;
    for (const bool links : {false, true}) {
        functions.openLink = links ? fake::openLink : nullptr;
        functions.queryLink = fake::queryLink;
        functions.closeLink = fake::closeLink;
        fake::failing = links ? ERROR_ACCESS_DENIED : 0;
        VolumeTable table(functions);
        for (int round = 0; round < 2; ++round) {
            table.RefreshVolumes();
            EXPECT_EQ(table.MountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\", L"D:\\"}));
            EXPECT_EQ(log.take(),
                      std::vector<std::string>{std::string("1: Error: Failed to retrieve mount point names: ") +
                                               (links ? "00000005" : "00000000")});
        }
        EXPECT_EQ(table.mountPointOf(L"\\Device\\Volume{0}"), L"C:\\");
        EXPECT_EQ(table.mountPointOf(links ? L"\\Device\\Disk7" : L"\\Device\\Volume{1}"), L"C:\\mount\\");
    }
    // The system's own functions: a name resolves to itself where it is no link.
    VolumeFunctions system = VolumeFunctions::system();
    EXPECT_TRUE(system.openLink);
    system.driveType = fake::alwaysFixed;
    VolumeTable real(system);
    real.RefreshVolumes();
    EXPECT_EQ(real.MountPoints().count(L"C:\\"), 1u);
}

TEST(Graylist, IsBuiltPublishedAndReplaced)
{
    const InstalledService service;
    const TemporaryFolder local;
    for (const wchar_t* const name : {L"\\Microsoft", L"\\Microsoft\\Outlook", L"\\Microsoft\\Other", L"\\Cache"})
        CreateDirectoryW((local.path() + name).c_str(), nullptr);
    const AbsentUser user(L"S-1-5-21-1-2-3-4004", L"Local AppData", local.path());
    const wxString here = LongPath(local.path());
    wchar_t windows[MAX_PATH], before[MAX_PATH];
    GetWindowsDirectoryW(windows, MAX_PATH);
    // The test's own folders are in the temporary one.
    GetEnvironmentVariableW(L"TEMP", before, MAX_PATH);
    SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere\\..\\scratch");

    wxRegKey settings(GetSettingsKeyName());
    settings.Create();
    for (const long keeps : {1L, 0L}) {
        settings.SetValue(L"options.graylist", keeps);
        const PathTree* const first = GetGraylist(true);
        EXPECT_TRUE(temporaryHives().empty());
        const PathTree* const again = GetGraylist(false);
        EXPECT_EQ(again, first);
        again->Release();
        EXPECT_TRUE(IsGrayed(wxString(windows) + L"\\Temp\\x"));
        EXPECT_TRUE(IsGrayed(GetDataFilePath(kDataDirectory)));
        EXPECT_EQ(IsGrayed(wxString(windows) + L"\\notepad.exe"), keeps == 0);
        EXPECT_TRUE(IsGrayed(L"C:\\scratch\\x"));
        EXPECT_FALSE(IsGrayed(L"C:\\users"));
        EXPECT_EQ(first->Lookup(view(here + L"\\Microsoft\\Outlook\\mail.pst")), 8u);
        EXPECT_EQ(first->Lookup(view(here + L"\\Cache\\x")), keeps ? 8u : 7u);
        EXPECT_EQ(first->Lookup(view(here)), keeps ? 8u : 5u);
        EXPECT_EQ(IsGrayed(here) && IsPartlyGrayed(here), keeps == 0);
        EXPECT_FALSE(IsPartlyGrayed(here + L"\\Cache"));
        // An old list stays whole for who holds it.
        const PathTree* const next = GetGraylist(true);
        EXPECT_NE(next, first);
        EXPECT_EQ(first->Lookup(L"C:\\users\\x\\y"), next->Lookup(L"C:\\users\\x\\y"));
        next->Release();
        first->Release();
    }
    SetEnvironmentVariableW(L"TEMP", before);
    settings.DeleteValue(L"options.graylist");
    EXPECT_EQ(GetUserDataTree(true), GetUserDataTree(false));
    EXPECT_TRUE(IsUserData(wxString(windows) + L"\\Temp"));
    EXPECT_FALSE(IsUserData(GetDataFilePath(kDataDirectory)));
    DropGraylist();
    EXPECT_TRUE(IsGrayed(windows)) << "built again when there is none";
    DropGraylist();
}

// The watcher's own work on the real system; only the waiting is left out.
class AnHour : public WatcherServices {
  public:
    const Manifest* loadManifest() override
    {
        ++loads;
        return ReadStoredManifest();
    }
    bool manifestTime(std::int64_t& milliseconds) override
    {
        // The service writes a new list every ten minutes.
        milliseconds = readManifestTime().value_or(0) + ++rounds / 120 * 600000;
        return true;
    }
    std::int64_t now() override
    {
        return rounds / 120 * 600000;
    }
    void sleep(std::uint32_t milliseconds) override
    {
        slept += milliseconds;
        if (slept == 600000)
            early = countNow();
    }
    bool isStopping() override
    {
        return slept >= 3600000;
    }
    void buildExclusions(bool firstLoad) override
    {
        ++builds;
        BuildGraylist(!firstLoad);
    }

    WatcherState state;
    std::uint32_t slept = 0, rounds = 0, loads = 0, builds = 0;
    std::array<std::size_t, 3> early{};
};

TEST(ManifestWatcher, KeepsItsCountsThroughAnHourOfRounds)
{
    const InstalledService service;
    const TemporaryFolder history;
    const AbsentUser user(L"S-1-5-21-1-2-3-4005", L"History", history.path());
    LogCapture log;
    AnHour hour;
    RunManifestWatcher(hour.state, hour);
    EXPECT_EQ(hour.rounds, 719u);
    EXPECT_EQ(hour.loads, 6u);
    EXPECT_EQ(hour.builds, 40u);
    EXPECT_EQ(countNow(), hour.early);
    EXPECT_TRUE(temporaryHives().empty());
    for (const std::string& line : log.take())
        EXPECT_NE(line.find("stored manifest"), std::string::npos) << line; // there is none in this test
    hour.state.manifest.replace(nullptr);
    DropGraylist();
}

} // namespace
} // namespace tavi
