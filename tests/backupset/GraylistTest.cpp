#include "backupset/Graylist.h"

#include <algorithm>
#include <cwchar>
#include <filesystem>
#include <future>
#include <new>

#include <windows.h>
#include <sddl.h>

#include <gtest/gtest.h>

#include "backupset/ManifestWatcher.h"
#include "backupset/UserProfiles.h"
#include "backupset/Volumes.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "tests/support/Allocations.h"
#include "tests/support/Counts.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

void* operator new(std::size_t size)
{
    using tavi::test::FailingAllocations;
    const bool fails = FailingAllocations::thread == GetCurrentThreadId() && FailingAllocations::left-- <= 0;
    if (void* const block = fails ? nullptr : std::malloc(size))
        return block;
    throw std::bad_alloc();
}
void operator delete(void* block) noexcept
{
    const void* freed = block;
    tavi::test::FailingAllocations::watched.compare_exchange_strong(freed, nullptr);
    std::free(block);
}
void operator delete(void* block, std::size_t) noexcept
{
    operator delete(block);
}

namespace tavi {
namespace {

using namespace test;

KernelHandle processToken()
{
    KernelHandle token;
    OpenProcessToken(GetCurrentProcess(), TOKEN_ADJUST_PRIVILEGES | TOKEN_QUERY, token.out());
    return token;
}

bool privilegeIsOn(const wchar_t* name)
{
    return IsPrivilegeEnabled(processToken().get(), name);
}

LONG unloadByHand(const std::wstring& hive)
{
    SetPrivilege(processToken().get(), L"SeRestorePrivilege", true);
    const LONG code = RegUnLoadKeyW(HKEY_USERS, hive.c_str());
    SetPrivilege(processToken().get(), L"SeRestorePrivilege", false);
    return code;
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
        const KernelHandle token = processToken();
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
            EXPECT_EQ(unloadByHand(loaded[0]), ERROR_SUCCESS);
            SetPrivilege(processToken().get(), L"SeRestorePrivilege", true);
            UnloadUserHives();
            EXPECT_TRUE(privilegeIsOn(L"SeRestorePrivilege")) << "left as it was found";
            SetPrivilege(processToken().get(), L"SeRestorePrivilege", false);
            EXPECT_EQ(log.take(), std::vector<std::string>{"1: Error: Unable to unload temp reg hive " +
                                                           wxString(loaded[0]).utf8_string() + ": 2"});
        } else {
            UnloadUserHives();
            EXPECT_EQ(log.take(), std::vector<std::string>());
        }
        EXPECT_TRUE(temporaryHives().empty());
    }

    // Without memory at each point in turn no hive stays loaded and the nesting is as before.
    for (int succeeding = 0; temporaryHives().empty() && succeeding < 1000; ++succeeding) {
        const FailingAllocations failing(succeeding);
        try {
            LoadUserHives();
        } catch (const std::bad_alloc&) {
        }
    }
    EXPECT_EQ(temporaryHives().size(), 2u);
    {
        const FailingAllocations failing(0);
        UnloadUserHives();
    }
    EXPECT_TRUE(temporaryHives().empty());

    wchar_t shortPath[MAX_PATH];
    GetShortPathNameW(cookies.path().c_str(), shortPath, MAX_PATH);
    shortPath[0] = L'c';
    EXPECT_TRUE(LongPath(shortPath).IsSameAs(cookies.path(), false));
    EXPECT_EQ(LongPath(shortPath)[0], L'C');
    EXPECT_EQ(LongPath(cookies.path() + L"\\missing"), L"");
}

TEST(UserProfiles, WithoutThePrivilegesNothingIsLoadedOrLogged)
{
    const auto hivesAndLines = [] {
        LogCapture log;
        const AbsentUser user(L"S-1-5-21-1-2-3-4001", L"Cookies", L"C:\\");
        for (const wchar_t* const name : {L"SeBackupPrivilege", L"SeRestorePrivilege"}) {
            TOKEN_PRIVILEGES removal{1, {{{}, SE_PRIVILEGE_REMOVED}}};
            LookupPrivilegeValueW(nullptr, name, &removal.Privileges[0].Luid);
            AdjustTokenPrivileges(processToken().get(), FALSE, &removal, 0, nullptr, nullptr);
        }
        LoadUserHives();
        const std::size_t hives = temporaryHives().size();
        UnloadUserHives();
        return static_cast<int>(hives + log.take().size());
    };
    // In a process of its own: a removed privilege does not come back.
    EXPECT_EXIT(std::exit(hivesAndLines()), testing::ExitedWithCode(0), "");
}

// The system under Wine calls every volume's drive type unknown, has no folder mounts and no links between devices:
// each of these stands here as the system's documentation has it.
namespace fake {

int volume;
DWORD failing;
bool secondFails;
// Of searches and of links.
int openHandles;

HANDLE WINAPI findFirst(LPWSTR name, DWORD)
{
    std::wcscpy(name, L"\\\\?\\Volume{0}\\");
    volume = 0;
    ++openHandles;
    return GetProcessHeap();
}
HANDLE WINAPI findNothing(LPWSTR, DWORD)
{
    return INVALID_HANDLE_VALUE;
}
BOOL WINAPI findNext(HANDLE, LPWSTR name, DWORD)
{
    std::swprintf(name, 50, L"\\\\?\\Volume{%d}\\", ++volume);
    return volume < 4;
}
BOOL WINAPI findClose(HANDLE)
{
    --openHandles;
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
    // Volume 1 is mounted twice, volume 3 fails at the first or second question.
    const std::wstring all = volume == 1 ? std::wstring(L"D:\\\0C:\\mount\\\0", 14) : std::wstring(L"C:\\\0", 5);
    *length = static_cast<DWORD>(all.size());
    const bool fails = volume == 3 && secondFails == (size > 0);
    if (fails || size < all.size()) {
        SetLastError(fails ? failing : DWORD{ERROR_MORE_DATA});
        return fails && failing == 0;
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
    if (name != L"\\Device\\Volume{1}")
        return static_cast<NTSTATUS>(0xC0000024);
    ++openHandles;
    return 0;
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
    --openHandles;
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
    const struct {
        bool links, secondFails;
        DWORD code;
        const char* logged;
    } cases[] = {{false, false, 0, "00000000"}, {true, false, 5, "00000005"}, {true, true, 234, "000000ea"}};
    for (const auto& [links, secondFails, code, logged] : cases) {
        functions.openLink = links ? fake::openLink : nullptr;
        functions.queryLink = fake::queryLink;
        functions.closeLink = fake::closeLink;
        fake::failing = code;
        fake::secondFails = secondFails;
        VolumeTable table(functions);
        for (int round = 0; round < 2; ++round) {
            table.RefreshVolumes();
            EXPECT_EQ(table.MountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\", L"D:\\"}));
            EXPECT_EQ(log.take(), std::vector<std::string>{
                                      std::string("1: Error: Failed to retrieve mount point names: ") + logged});
            EXPECT_EQ(fake::openHandles, 0);
        }
        EXPECT_EQ(table.mountPointOf(L"\\Device\\Volume{0}"), L"C:\\");
        EXPECT_EQ(table.mountPointOf(links ? L"\\Device\\Disk7" : L"\\Device\\Volume{1}"), L"C:\\mount\\");
    }
    functions.findFirst = fake::findNothing;
    VolumeTable none(functions);
    none.RefreshVolumes();
    EXPECT_TRUE(none.MountPoints().empty() && log.take().empty());
    EXPECT_EQ(fake::openHandles, 0);
    // The system's own functions: a name resolves to itself where it is no link.
    VolumeFunctions system = VolumeFunctions::system();
    EXPECT_TRUE(system.openLink);
    system.driveType = fake::alwaysFixed;
    VolumeTable real(system);
    real.RefreshVolumes();
    EXPECT_EQ(real.MountPoints().count(L"C:\\"), 1u);
}

// Users whose places have every odd state; the folders are named after it. A build logs one line, since the install key
// names no data folder.
class Graylists : public testing::Test {
  protected:
    Graylists()
    {
        for (const wchar_t* const name : {L"\\1\\Identities", L"\\3\\Microsoft\\Outlook", L"\\3\\Microsoft\\Other",
                                          L"\\5\\Identities", L"\\5\\Cache", L"\\7"})
            std::filesystem::create_directories(root_.path() + name);
        wxRegKey(GetSettingsKeyName()).Create();
        service_.install().DeleteValue(L"DataPath");
        DropGraylist();
    }
    ~Graylists() override
    {
        DropGraylist();
    }
    LogCapture log_;
    InstalledService service_;
    const TemporaryFolder root_;
    const AbsentUser users_[4] = {{L"S-1-5-21-1-2-3-4004", L"Local Settings", root_.path()},
                                  {L"S-1-5-21-1-2-3-4005", L"Local AppData", root_.path() + L"\\1"},
                                  {L"S-1-5-21-1-2-3-4006", L"Local AppData", root_.path() + L"\\3"},
                                  {L"S-1-5-21-1-2-3-4007", L"Local AppData", root_.path() + L"\\5"}};
    const wxString here_ = LongPath(root_.path());
};

TEST_F(Graylists, AreBuiltPublishedAndReplaced)
{
    wchar_t windows[MAX_PATH], temp[MAX_PATH];
    GetWindowsDirectoryW(windows, MAX_PATH);
    // The test's own folders are in the temporary one.
    GetEnvironmentVariableW(L"TEMP", temp, MAX_PATH);
    SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere\\..\\scratch");
    service_.install().SetValue(L"DataPath", L"C:\\served");
    for (const long keeps : {1L, 0L}) {
        wxRegKey(GetSettingsKeyName()).SetValue(L"options.graylist", keeps);
        const PathTree* const first = GetGraylist(true);
        EXPECT_TRUE(temporaryHives().empty());
        const PathTree* const again = GetGraylist(false);
        EXPECT_EQ(again, first);
        again->Release();
        EXPECT_TRUE(IsGrayed(wxString(windows) + L"\\Temp\\x") && IsGrayed(L"C:\\served"));
        EXPECT_EQ(IsGrayed(wxString(windows) + L"\\notepad.exe"), keeps == 0);
        EXPECT_TRUE(IsGrayed(L"C:\\scratch\\x"));
        EXPECT_FALSE(IsGrayed(L"C:\\users"));
        EXPECT_EQ(first->Lookup(view(here_)), keeps ? 8u : 5u);
        EXPECT_EQ(first->Lookup(view(here_ + L"\\3\\Microsoft\\Outlook\\mail.pst")), 8u);
        // An old list stays whole for who holds it.
        const PathTree* const next = GetGraylist(true);
        EXPECT_NE(next, first);
        EXPECT_EQ(first->Lookup(L"C:\\users\\x\\y"), next->Lookup(L"C:\\users\\x\\y"));
        next->Release();
        first->Release();
    }
    SetEnvironmentVariableW(L"TEMP", temp);
}

TEST_F(Graylists, AnswerByStateAndCountWhatTheListInForceDoesNotLeaveOut)
{
    const PathTree* users = GetUserDataTree(true);
    EXPECT_EQ(GetUserDataTree(false), users);
    EXPECT_EQ(users->Lookup(view(here_)), 5u);
    for (const PathState state : {1u, 3u, 5u, 7u}) {
        const wxString folder = here_ + wxString::Format(L"\\%u", static_cast<unsigned>(state));
        EXPECT_EQ(users->Lookup(view(folder)), state);
        EXPECT_TRUE(IsUserData(folder));
        EXPECT_EQ(IsGrayed(folder), state != 1) << state;
        EXPECT_EQ(IsPartlyGrayed(folder), state != 7) << state;
    }
    EXPECT_FALSE(IsUserData(L"C:\\users") || IsUserData(here_ + L"\\1\\Identities"));

    // Where a list is in force, the folder 7 and the cache do not count, and each entry left has a rule of its own.
    users = GetUserDataTree(true);
    for (const wchar_t* const name : {L"", L"\\3", L"\\5"})
        EXPECT_EQ(users->Lookup(view(here_ + name)), 1u) << name;
    // Among the users' places all count, also where another list comes into force during the build.
    log_.onNextLine([] { GetGraylist(false)->Release(); });
    const PathTree* const built = GetGraylist(true);
    EXPECT_EQ(log_.take().size(), 3u); // one for each list
    EXPECT_EQ(built->Lookup(view(here_)), 5u);
    built->Release();
}

TEST_F(Graylists, AreBuiltOneAfterTheOtherAndPublishedBeforeTheHivesGo)
{
    std::future<const PathTree*> waiter, users;
    const PathTree* published = nullptr;
    log_.onNextLine([&] {
        waiter = std::async(std::launch::async, [] { return GetGraylist(false); });
        users = std::async(std::launch::async, [] { return GetUserDataTree(true); });
        EXPECT_EQ(users.wait_for(std::chrono::milliseconds(500)), std::future_status::timeout);
        EXPECT_EQ(unloadByHand(temporaryHives().at(0)), ERROR_SUCCESS);
        // The next line says that this hive cannot be unloaded.
        log_.onNextLine([&] {
            published = GetGraylist(false);
            published->Release();
        });
    });
    const PathTree* const built = GetGraylist(true);
    EXPECT_EQ(published, built);
    EXPECT_EQ(users.get(), GetUserDataTree(false));
    // The waiter has no reference: with the builder's and the published one the tree goes.
    EXPECT_EQ(waiter.get(), built);
    FailingAllocations::watched = built;
    built->Release();
    EXPECT_EQ(FailingAllocations::watched, built);
    DropGraylist();
    EXPECT_EQ(FailingAllocations::watched, nullptr);
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
    Counts early;
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
