#include "exclusions/Graylist.h"

#include <filesystem>
#include <future>

#include <gtest/gtest.h>

#include "core/Options.h"
#include "tests/support/Allocations.h"
#include "tests/support/Counts.h"
#include "tests/support/Hives.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

constexpr auto adopt = RefPtr<const PathTree>::adopt;

// Users whose folders get every odd state, by which they are named. Each build logs one line, since the install key
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

TEST_F(Graylists, HoldTheSystemsPlacesAndTheUsersUnlessSwitchedOff)
{
    wchar_t temporary[MAX_PATH];
    GetEnvironmentVariableW(L"TEMP", temporary, MAX_PATH);
    // The test's own folders are below the real one.
    SetEnvironmentVariableW(L"TEMP", L"C:\\elsewhere\\..\\scratch");
    service_.install().SetValue(L"DataPath", L"C:\\served");
    for (const bool keeps : {true, false}) {
        wxRegKey(getSettingsKeyName()).SetValue(L"options.graylist", long{keeps});
        getGraylist(true)->Release();
        for (const wchar_t* const path : {L"C:\\windows\\Temp\\x", L"C:\\served", L"C:\\scratch\\x"})
            EXPECT_TRUE(isGrayed(path)) << path;
        for (const wxString& path : {wxString(L"C:\\windows\\notepad.exe"), here_})
            EXPECT_EQ(isGrayed(path), !keeps) << path;
        EXPECT_FALSE(isGrayed(L"C:\\users") || isGrayed(here_ + L"\\3\\Microsoft\\Outlook\\mail.pst"));
    }
    SetEnvironmentVariableW(L"TEMP", temporary);
}

TEST_F(Graylists, StayWholeForTheirHoldersWhenReplaced)
{
    const auto first = adopt(getGraylist(true));
    EXPECT_EQ(adopt(getGraylist(false)).get(), first.get());
    const Counts counts = countNow();
    const auto next = adopt(getGraylist(true));
    EXPECT_NE(next.get(), first.get());
    EXPECT_EQ(first->lookup(L"C:\\users\\x\\y"), next->lookup(L"C:\\users\\x\\y"));
    EXPECT_TRUE(temporaryHives().empty());
    EXPECT_EQ(countNow(), counts);
}

TEST_F(Graylists, AnswerByState)
{
    const PathTree* const users = getUserDataTree(true);
    EXPECT_EQ(getUserDataTree(false), users);
    for (const std::uint32_t state : {1u, 3u, 5u, 7u}) {
        const wxString folder = here_ + wxString::Format(L"\\%u", state);
        EXPECT_EQ(users->lookup(view(folder)), FolderState{state});
        EXPECT_TRUE(isUserData(folder)) << state;
        EXPECT_EQ(isGrayed(folder), state != 1) << state;
        EXPECT_EQ(isPartlyGrayed(folder), state != 7) << state;
    }
    EXPECT_FALSE(isUserData(L"C:\\users") || isUserData(here_ + L"\\1\\Identities"));
}

TEST_F(Graylists, CountNoEntryThatTheListInForceLeavesOut)
{
    getGraylist(true)->Release();
    // The folder 7 and the cache do not count, so each entry left has a rule of its own.
    const PathTree* const users = getUserDataTree(true);
    for (const wchar_t* const name : {L"", L"\\3", L"\\5"})
        EXPECT_EQ(users->lookup(view(here_ + name)), FolderState::on) << name;
    // In the users' places all count, also if another list is published during the build.
    log_.take();
    log_.onNextLine([] { getGraylist(false)->Release(); });
    EXPECT_EQ(adopt(getGraylist(true))->lookup(view(here_)), FolderState::onMostOn);
    EXPECT_EQ(log_.take().size(), 2u) << "one for each list";
}

TEST_F(Graylists, AreBuiltOneAtATimeAndPublishedBeforeTheHivesAreUnloaded)
{
    std::future<const PathTree*> waiter, users, reader;
    log_.onNextLine([&] {
        waiter = std::async(std::launch::async, [] { return getGraylist(false); });
        users = std::async(std::launch::async, [] { return getUserDataTree(true); });
        EXPECT_EQ(users.wait_for(std::chrono::milliseconds(500)), std::future_status::timeout);
        unloadHive(temporaryHives().at(0));
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
    // The waiter has no reference: the builder's and the published one are the last.
    EXPECT_EQ(waiter.get(), built);
    FailingAllocations::watched = built;
    built->Release();
    EXPECT_EQ(FailingAllocations::watched, built);
    dropGraylist();
    EXPECT_EQ(FailingAllocations::watched, nullptr);
}

} // namespace
} // namespace tavi
