#include "exclusions/Graylist.h"

#include <future>

#include <malloc.h>
#include <gtest/gtest.h>

#include "core/Options.h"
#include "exclusions/UserProfiles.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;
using namespace tavi::test;

namespace {

using Tree = RefPtr<const PathTree>;

// Users whose folders get every odd state, by which they are named. Each build logs one line, since the install key
// names no data folder.
struct Graylists : testing::Test {
    Graylists()
    {
        for (const wchar_t* const name : {L"\\1\\Identities", L"\\3\\Microsoft\\Outlook", L"\\3\\Microsoft\\Other",
                                          L"\\5\\Identities", L"\\5\\Cache", L"\\7"})
            std::filesystem::create_directories(root.path() + name);
        // The folders of this test are below the real one.
        SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere\\..\\scratch");
        settingsKey().Create();
        service.install().DeleteValue(L"DataPath");
        dropGraylist();
    }
    LogCapture log;
    InstalledService service;
    const TemporaryFolder root;
    const AbsentUser absent[3] = {{{{L"Local Settings", root.path()}, {L"Local AppData", root.path() + L"\\1"}}},
                                  {{{L"Local AppData", root.path() + L"\\3"}}},
                                  {{{L"Local AppData", root.path() + L"\\5"}}}};
    const wxString here = longPath(root.path());
};

TEST_F(Graylists, HoldTheSystemsPlacesAndTheUsersUnlessSwitchedOff)
{
    service.install().SetValue(L"DataPath", L"C:\\served");
    std::filesystem::create_directory(L"C:\\windows\\$tavi");
    constexpr const wchar_t* kMemory = L"System\\CurrentControlSet\\Control\\Session Manager\\Memory Management";
    const wchar_t files[] = L"C:\\one.sys 1 2\0C:\\two.sys 1 2\0";
    RegSetKeyValueW(HKEY_LOCAL_MACHINE, kMemory, L"PagingFiles", REG_MULTI_SZ, files, sizeof(files));
    for (const bool keeps : {true, false}) {
        settingsKey().SetValue(L"options.graylist", long{keeps});
        getGraylist(true)->Release();
        for (const wchar_t* const place :
             {L"C:\\windows\\Temp\\x", L"C:\\served", L"C:\\two.sys", L"C:\\scratch\\x", L"C:\\windows\\$tavi\\x"})
            EXPECT_TRUE(isGrayed(place)) << place;
        EXPECT_EQ(isGrayed(L"C:\\windows\\notepad.exe"), !keeps);
        EXPECT_EQ(isGrayed(here), !keeps);
        EXPECT_FALSE(isGrayed(L"C:\\users"));
        EXPECT_FALSE(isGrayed(here + L"\\3\\Microsoft\\Outlook\\mail.pst"));
    }
    RegDeleteKeyValueW(HKEY_LOCAL_MACHINE, kMemory, L"PagingFiles");
}

TEST_F(Graylists, AnswerByState)
{
    const PathTree* const users = getUserDataTree(true);
    for (const std::uint32_t state : {1u, 3u, 5u, 7u}) {
        const wxString folder = here + wxString::Format(L"\\%u", state);
        EXPECT_EQ(users->lookup(view(folder)), FolderState{state});
        EXPECT_TRUE(isUserData(folder)) << state;
        EXPECT_EQ(isGrayed(folder), state != 1) << state;
        EXPECT_EQ(isPartlyGrayed(folder), state != 7) << state;
    }
    EXPECT_FALSE(isUserData(L"C:\\users"));
    EXPECT_FALSE(isUserData(here + L"\\1\\Identities"));
}

TEST_F(Graylists, CountNoEntryThatTheListInForceLeavesOut)
{
    getGraylist(true)->Release();
    // The folder 7 and the cache do not count, so each entry left has a rule of its own.
    for (const wchar_t* const name : {L"", L"\\3", L"\\5"})
        EXPECT_EQ(getUserDataTree(true)->lookup(view(here + name)), FolderState::on) << name;
    // In the users' places all count, also if another list is published during the build.
    log.onNextLine([] { getGraylist(false)->Release(); });
    EXPECT_EQ(Tree::adopt(getGraylist(true))->lookup(view(here)), FolderState::onMostOn);
    EXPECT_EQ(log.take().size(), 3u) << "one for each list";
}

TEST_F(Graylists, AreBuiltOneAtATimeAndPublishedBeforeTheHivesAreUnloaded)
{
    std::future<const PathTree*> waiter, builder, reader;
    std::wstring hive;
    log.onNextLine([&] {
        waiter = std::async(std::launch::async, getGraylist, false);
        builder = std::async(std::launch::async, getUserDataTree, true);
        EXPECT_EQ(builder.wait_for(std::chrono::milliseconds(500)), std::future_status::timeout);
        setPrivilege(processToken().get(), L"SeRestorePrivilege", true);
        EXPECT_EQ(RegUnLoadKeyW(HKEY_USERS, (hive = temporaryHives().at(0)).c_str()), ERROR_SUCCESS);
        setPrivilege(processToken().get(), L"SeRestorePrivilege", false);
        log.onNextLine([&] {
            reader = std::async(std::launch::async, getGraylist, false);
            EXPECT_EQ(reader.wait_for(std::chrono::minutes(1)), std::future_status::ready);
        });
    });
    const PathTree* const built = getGraylist(true);
    EXPECT_EQ(Tree::adopt(reader.get()).get(), built);
    EXPECT_EQ(builder.get(), getUserDataTree(false));
    EXPECT_EQ(log.take().back(), "1: Error: Unable to unload temp reg hive " + toUtf8(hive) + ": 2");
    // The waiter has no reference: the builder's and the published one are the last.
    EXPECT_EQ(waiter.get(), built);
    const auto isFreed = [&] { return !HeapValidate(reinterpret_cast<HANDLE>(_get_heap_handle()), 0, built); };
    built->Release();
    EXPECT_FALSE(isFreed());
    dropGraylist();
    EXPECT_TRUE(isFreed());
}

} // namespace
