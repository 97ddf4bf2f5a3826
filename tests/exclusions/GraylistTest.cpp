#include "exclusions/Graylist.h"

#include <algorithm>
#include <cwchar>
#include <filesystem>
#include <future>
#include <new>

#include <windows.h>

#include <gtest/gtest.h>

#include "exclusions/UserProfiles.h"
#include "exclusions/Volumes.h"
#include "core/Handles.h"
#include "core/Options.h"
#include "core/Privileges.h"
#include "core/RefCounted.h"
#include "tests/support/Allocations.h"
#include "tests/support/Counts.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

void* operator new(std::size_t size)
{
    using namespace tavi::test;
    if (void* const block = FailingAllocations::fails(Heap::cpp) ? nullptr : std::malloc(size))
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

void switchPrivilege(const wchar_t* name, bool enable)
{
    setPrivilege(processToken().get(), name, enable);
}

bool privilegeIsOn(const wchar_t* name)
{
    return isPrivilegeEnabled(processToken().get(), name);
}

// A user who is not logged on: a profile with a hive that names one shell folder.
class AbsentUser {
  public:
    AbsentUser(const wchar_t* shellFolder, const std::wstring& path)
    {
        RegistryKey source;
        RegCreateKeyW(HKEY_CURRENT_USER, L"Software\\TaviTestHive", source.out());
        RegSetKeyValueW(source.get(), L"Software\\Microsoft\\Windows\\CurrentVersion\\Explorer\\Shell Folders",
                        shellFolder, REG_SZ, path.c_str(), static_cast<DWORD>((path.size() + 1) * sizeof(wchar_t)));
        switchPrivilege(L"SeBackupPrivilege", true);
        EXPECT_EQ(RegSaveKeyW(source.get(), hiveFile().c_str(), nullptr), ERROR_SUCCESS);
        switchPrivilege(L"SeBackupPrivilege", false);
        RegDeleteTreeW(HKEY_CURRENT_USER, L"Software\\TaviTestHive");

        const SID sid = {SID_REVISION, 1, SECURITY_NT_AUTHORITY, {SECURITY_LOCAL_SERVICE_RID}};
        wxMemoryBuffer bytes;
        bytes.AppendData(&sid, sizeof(sid));
        profile_.Create();
        profile_.SetValue(L"Sid", bytes);
        profile_.SetValue(L"ProfileImagePath", wxString(folder_.path()));
    }
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
    TemporaryFolder folder_;
    // Numbers the users that exist: a later run overwrites what a crash has left behind.
    static inline int users_ = 4000;
    wxRegKey profile_{L"HKLM\\Software\\Microsoft\\Windows NT\\CurrentVersion\\ProfileList\\S-1-5-21-1-2-3-" +
                      std::to_wstring(users_++)};
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
    wchar_t shortPath[MAX_PATH];
    GetShortPathNameW(cookies.path().c_str(), shortPath, MAX_PATH);
    shortPath[0] = L'c';
    const AbsentUser one(L"Cookies", cookies.path()), other(L"Cookies", shortPath), lost(L"Cookies", cookies.path());
    DeleteFileW(lost.hiveFile().c_str());
    const auto isCookies = [&](const wxString& path) {
        return path[0] == L'C' && path.IsSameAs(cookies.path(), false);
    };
    loadUserHives();
    const auto loaded = temporaryHives();
    EXPECT_EQ(loaded.size(), 2u);
    loadUserHives();
    unloadUserHives();
    EXPECT_EQ(temporaryHives(), loaded) << "a nested pair does nothing";
    const auto paths = shellFolderPaths(L"Cookies");
    EXPECT_EQ(std::count_if(paths.begin(), paths.end(), isCookies), 2);
    EXPECT_FALSE(privilegeIsOn(L"SeBackupPrivilege") || privilegeIsOn(L"SeRestorePrivilege"));
    switchPrivilege(L"SeRestorePrivilege", true);
    EXPECT_EQ(RegUnLoadKeyW(HKEY_USERS, loaded[0].c_str()), ERROR_SUCCESS);
    unloadUserHives();
    EXPECT_EQ(log.takeText(), "1: Error: Unable to unload temp reg hive " + wxString(loaded[0]).utf8_string() + ": 2");
    EXPECT_TRUE(privilegeIsOn(L"SeRestorePrivilege")) << "left as it was found";
    switchPrivilege(L"SeRestorePrivilege", false);

    // Without memory at each point in turn no hive stays loaded and the nesting is as before.
    for (int succeeding = 0; temporaryHives().empty() && succeeding < 1000; ++succeeding) {
        const FailingAllocations failing(succeeding);
        try {
            loadUserHives();
        } catch (const std::bad_alloc&) {
        }
    }
    EXPECT_EQ(temporaryHives().size(), 2u);
    EXPECT_NE(temporaryHives(), loaded) << "a name is used once";
    {
        const FailingAllocations failing(0);
        unloadUserHives();
    }
    EXPECT_TRUE(temporaryHives().empty() && log.take().empty());
    EXPECT_EQ(longPath(cookies.path() + L"\\missing"), L"");
}

TEST(UserProfiles, WithoutThePrivilegesNothingIsLoadedOrLogged)
{
    const auto hivesAndLines = [] {
        LogCapture log;
        const AbsentUser user(L"Cookies", L"C:\\");
        for (const wchar_t* const name : {L"SeBackupPrivilege", L"SeRestorePrivilege"}) {
            TOKEN_PRIVILEGES removal{1, {{{}, SE_PRIVILEGE_REMOVED}}};
            LookupPrivilegeValueW(nullptr, name, &removal.Privileges[0].Luid);
            AdjustTokenPrivileges(processToken().get(), FALSE, &removal, 0, nullptr, nullptr);
        }
        loadUserHives();
        const std::size_t hives = temporaryHives().size();
        unloadUserHives();
        return static_cast<int>(hives + log.take().size());
    };
    // In a process of its own: a removed privilege does not come back.
    EXPECT_EXIT(std::exit(hivesAndLines()), testing::ExitedWithCode(0), "");
}

// Wine calls the drive type of every volume unknown and has neither folder mounts nor device links: these functions
// answer as Windows does, for volumes 0 to 3. Volume 1 is mounted twice, volume 2 is removable, volume 3 fails.
namespace fake {

int volume, volumes;
DWORD failing;
bool secondFails;
// Of searches and of links.
int openHandles;

template <class Result>
Result WINAPI close(HANDLE)
{
    --openHandles;
    return 0;
}
HANDLE WINAPI findFirst(LPWSTR name, DWORD)
{
    std::wcscpy(name, L"\\\\?\\Volume{0}\\");
    volume = 0;
    openHandles += volumes > 0;
    return volumes > 0 ? GetProcessHeap() : INVALID_HANDLE_VALUE;
}
BOOL WINAPI findNext(HANDLE, LPWSTR name, DWORD)
{
    std::swprintf(name, 50, L"\\\\?\\Volume{%d}\\", ++volume);
    return volume < volumes;
}
DWORD WINAPI queryDevice(LPCWSTR name, LPWSTR target, DWORD)
{
    return static_cast<DWORD>(std::swprintf(target, 50, L"\\Device\\%ls", name));
}
UINT WINAPI driveType(LPCWSTR name)
{
    return std::wcscmp(name, L"\\\\?\\Volume{2}\\") == 0 ? DRIVE_REMOVABLE : DRIVE_FIXED;
}
BOOL WINAPI pathNames(LPCWSTR, LPWSTR paths, DWORD size, PDWORD length)
{
    std::wstring all = volume == 1 ? std::wstring(L"D:\\\0C:\\mount\\\0", 14) : std::wstring(L"C:\\\0", 5);
    all[0] = static_cast<wchar_t>(L'C' + volume);
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
    const bool isLink = name == L"\\Device\\Volume{1}";
    openHandles += isLink;
    return isLink ? 0 : static_cast<NTSTATUS>(0xC0000024);
}
NTSTATUS NTAPI queryLink(HANDLE, UNICODE_STRING* target, ULONG* bytes)
{
    static constexpr wchar_t kName[] = L"\\Device\\Disk7";
    *bytes = sizeof(kName) - sizeof(wchar_t);
    if (target->MaximumLength < *bytes)
        return static_cast<NTSTATUS>(0xC0000023);
    std::copy(kName, std::end(kName) - 1, target->Buffer);
    target->Length = static_cast<USHORT>(*bytes);
    return 0;
}

} // namespace fake

TEST(Volumes, AreTheMountPointsOfFixedVolumes)
{
    LogCapture log;
    VolumeFunctions functions{fake::findFirst, fake::findNext, fake::close<BOOL>, fake::queryDevice,    fake::driveType,
                              fake::pathNames, fake::openLink, fake::queryLink,   fake::close<NTSTATUS>};
    const std::tuple<bool, bool, DWORD, const char*> cases[] = {
        {true, false, 5, "00000005"}, {true, true, 234, "000000ea"}, {false, false, 0, "00000000"}};
    for (const auto& [links, secondFails, code, logged] : cases) {
        functions.openLink = links ? fake::openLink : nullptr;
        fake::volumes = 4;
        fake::failing = code;
        fake::secondFails = secondFails;
        VolumeTable table(functions);
        table.refreshVolumes();
        table.refreshVolumes();
        const std::string line = std::string("1: Error: Failed to retrieve mount point names: ") + logged;
        EXPECT_EQ(log.takeText(), line + line);
        EXPECT_EQ(table.mountPoints(), (std::set<wxString>{L"C:\\", L"C:\\mount\\", L"D:\\"}));
        EXPECT_EQ(table.mountPointOf(L"\\Device\\Volume{0}"), L"C:\\");
        EXPECT_EQ(table.mountPointOf(links ? L"\\Device\\Disk7" : L"\\Device\\Volume{1}"), L"C:\\mount\\");
        fake::volumes = 0;
        table.refreshVolumes();
        EXPECT_TRUE(table.mountPoints().empty() && log.take().empty());
        EXPECT_EQ(fake::openHandles, 0);
    }
    // The system's own functions: a name resolves to itself where it is no link.
    VolumeFunctions system = VolumeFunctions::system();
    EXPECT_TRUE(system.openLink);
    system.driveType = fake::driveType;
    VolumeTable real(system);
    real.refreshVolumes();
    EXPECT_EQ(real.mountPoints().count(L"C:\\"), 1u);
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
        wxRegKey(getSettingsKeyName()).Create();
        service_.install().DeleteValue(L"DataPath");
        dropGraylist();
    }
    LogCapture log_;
    InstalledService service_;
    const TemporaryFolder root_;
    const AbsentUser users_[4] = {{L"Local Settings", root_.path()},
                                  {L"Local AppData", root_.path() + L"\\1"},
                                  {L"Local AppData", root_.path() + L"\\3"},
                                  {L"Local AppData", root_.path() + L"\\5"}};
    const wxString here_ = longPath(root_.path());
};

TEST_F(Graylists, AreBuiltPublishedAndReplaced)
{
    wchar_t windows[MAX_PATH], temp[MAX_PATH];
    GetWindowsDirectoryW(windows, MAX_PATH);
    // The test's own folders are in the temporary one.
    GetEnvironmentVariableW(L"TEMP", temp, MAX_PATH);
    SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere\\..\\scratch");
    service_.install().SetValue(L"DataPath", L"C:\\served");
    std::vector<Counts> counts;
    for (const long keeps : {1L, 0L, 0L}) {
        wxRegKey(getSettingsKeyName()).SetValue(L"options.graylist", keeps);
        const auto first = RefPtr<const PathTree>::adopt(getGraylist(true)),
                   again = RefPtr<const PathTree>::adopt(getGraylist(false));
        EXPECT_TRUE(temporaryHives().empty());
        EXPECT_EQ(again.get(), first.get());
        EXPECT_TRUE(isGrayed(wxString(windows) + L"\\Temp\\x") && isGrayed(L"C:\\served") &&
                    isGrayed(L"C:\\scratch\\x"));
        EXPECT_EQ(isGrayed(wxString(windows) + L"\\notepad.exe"), keeps == 0);
        EXPECT_FALSE(isGrayed(L"C:\\users"));
        EXPECT_EQ(first->lookup(view(here_)), keeps ? FolderState::allOff : FolderState::onMostOn);
        EXPECT_EQ(first->lookup(view(here_ + L"\\3\\Microsoft\\Outlook\\mail.pst")), FolderState::allOff);
        // An old list stays whole for who holds it.
        const auto next = RefPtr<const PathTree>::adopt(getGraylist(true));
        EXPECT_NE(next.get(), first.get());
        EXPECT_EQ(first->lookup(L"C:\\users\\x\\y"), next->lookup(L"C:\\users\\x\\y"));
        counts.push_back(countNow());
    }
    EXPECT_EQ(counts[2], counts[1]);
    SetEnvironmentVariableW(L"TEMP", temp);
}

TEST_F(Graylists, AnswerByStateAndCountWhatTheListInForceDoesNotLeaveOut)
{
    const PathTree* users = getUserDataTree(true);
    EXPECT_EQ(getUserDataTree(false), users);
    EXPECT_EQ(users->lookup(view(here_)), FolderState::onMostOn);
    for (const std::uint32_t state : {1u, 3u, 5u, 7u}) {
        const wxString folder = here_ + wxString::Format(L"\\%u", state);
        EXPECT_EQ(users->lookup(view(folder)), FolderState{state});
        EXPECT_TRUE(isUserData(folder));
        EXPECT_EQ(isGrayed(folder), state != 1) << state;
        EXPECT_EQ(isPartlyGrayed(folder), state != 7) << state;
    }
    EXPECT_FALSE(isUserData(L"C:\\users") || isUserData(here_ + L"\\1\\Identities"));

    // Where a list is in force, the folder 7 and the cache do not count, and each entry left has a rule of its own.
    users = getUserDataTree(true);
    for (const wchar_t* const name : {L"", L"\\3", L"\\5"})
        EXPECT_EQ(users->lookup(view(here_ + name)), FolderState::on) << name;
    // Among the users' places all count, also where another list comes into force during the build.
    log_.onNextLine([] { getGraylist(false)->Release(); });
    const auto built = RefPtr<const PathTree>::adopt(getGraylist(true));
    EXPECT_EQ(log_.take().size(), 3u); // one for each list
    EXPECT_EQ(built->lookup(view(here_)), FolderState::onMostOn);
}

TEST_F(Graylists, AreBuiltOneAfterTheOtherAndPublishedBeforeTheHivesGo)
{
    std::future<const PathTree*> waiter, users, reader;
    log_.onNextLine([&] {
        waiter = std::async(std::launch::async, [] { return getGraylist(false); });
        users = std::async(std::launch::async, [] { return getUserDataTree(true); });
        EXPECT_EQ(users.wait_for(std::chrono::milliseconds(500)), std::future_status::timeout);
        switchPrivilege(L"SeRestorePrivilege", true);
        EXPECT_EQ(RegUnLoadKeyW(HKEY_USERS, temporaryHives().at(0).c_str()), ERROR_SUCCESS);
        switchPrivilege(L"SeRestorePrivilege", false);
        // The next line says that this hive cannot be unloaded.
        log_.onNextLine([&] {
            reader = std::async(std::launch::async, [] { return getGraylist(false); });
            EXPECT_EQ(reader.wait_for(std::chrono::seconds(10)), std::future_status::ready);
        });
    });
    const PathTree* const built = getGraylist(true);
    EXPECT_EQ(reader.get(), built);
    built->Release(); // the reader's
    EXPECT_EQ(users.get(), getUserDataTree(false));
    // The waiter has no reference: with the builder's and the published one the tree goes.
    EXPECT_EQ(waiter.get(), built);
    FailingAllocations::watched = built;
    built->Release();
    EXPECT_EQ(FailingAllocations::watched, built);
    dropGraylist();
    EXPECT_EQ(FailingAllocations::watched, nullptr);
}

} // namespace
} // namespace tavi
