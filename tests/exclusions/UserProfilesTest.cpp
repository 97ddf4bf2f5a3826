#include "exclusions/UserProfiles.h"

#include <algorithm>
#include <new>
#include <set>

#include <gtest/gtest.h>

#include "core/Utf8.h"
#include "tests/support/Allocations.h"
#include "tests/support/Hives.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

using namespace test;

// Three users who are not logged on, the last without a hive.
class UserProfiles : public testing::Test {
  protected:
    UserProfiles()
    {
        DeleteFileW(users_[2].hiveFile().c_str());
    }
    LogCapture log_;
    const AbsentUser users_[3] = {{L"Cookies", L"c:\\windows"}, {L"Cookies", L"c:\\windows"}, {L"Cookies", L"C:\\"}};
};

TEST_F(UserProfiles, AreReachableFromTheOutermostLoadToItsUnload)
{
    std::set<std::wstring> names;
    for (int round = 0; round < 2; ++round) {
        loadUserHives();
        const auto loaded = temporaryHives();
        names.insert(loaded.begin(), loaded.end());
        const auto paths = shellFolderPaths(L"Cookies");
        EXPECT_EQ(std::count(paths.begin(), paths.end(), L"C:\\windows"), 2);
        loadUserHives();
        unloadUserHives();
        EXPECT_EQ(temporaryHives(), loaded) << "after a nested pair";
        unloadUserHives();
        EXPECT_TRUE(temporaryHives().empty());
    }
    EXPECT_EQ(names.size(), 4u) << "each load uses new names";
}

TEST_F(UserProfiles, LeaveThePrivilegesAsTheyWere)
{
    const KernelHandle token = processToken();
    loadUserHives();
    EXPECT_FALSE(isPrivilegeEnabled(token.get(), L"SeBackupPrivilege"));
    EXPECT_FALSE(isPrivilegeEnabled(token.get(), L"SeRestorePrivilege"));
    setPrivilege(token.get(), L"SeRestorePrivilege", true);
    unloadUserHives();
    EXPECT_TRUE(isPrivilegeEnabled(token.get(), L"SeRestorePrivilege"));
    setPrivilege(token.get(), L"SeRestorePrivilege", false);
}

TEST_F(UserProfiles, LogAHiveThatCannotBeUnloaded)
{
    loadUserHives();
    const std::wstring hive = temporaryHives().at(0);
    unloadHive(hive);
    unloadUserHives();
    EXPECT_EQ(log_.takeText(), "1: Error: Unable to unload temp reg hive " + toUtf8(hive) + ": 2");
}

TEST_F(UserProfiles, LeaveNoHiveLoadedWhereMemoryRunsOut)
{
    for (int succeeding = 0; temporaryHives().empty() && succeeding < 1000; ++succeeding) {
        const FailingAllocations failing(succeeding);
        try {
            loadUserHives();
        } catch (const std::bad_alloc&) {
        }
    }
    EXPECT_EQ(temporaryHives().size(), 2u);
    {
        const FailingAllocations failing(0);
        unloadUserHives();
    }
    EXPECT_TRUE(temporaryHives().empty() && log_.take().empty());
}

TEST_F(UserProfiles, StayUnloadedInSilenceWithoutThePrivileges)
{
    const auto hivesAndLines = [&] {
        for (const wchar_t* const name : {L"SeBackupPrivilege", L"SeRestorePrivilege"}) {
            TOKEN_PRIVILEGES removal{1, {{{}, SE_PRIVILEGE_REMOVED}}};
            LookupPrivilegeValueW(nullptr, name, &removal.Privileges[0].Luid);
            AdjustTokenPrivileges(processToken().get(), FALSE, &removal, 0, nullptr, nullptr);
        }
        loadUserHives();
        return static_cast<int>(temporaryHives().size() + log_.take().size());
    };
    // In a process of its own, since a removed privilege cannot be enabled again.
    EXPECT_EXIT(std::exit(hivesAndLines()), testing::ExitedWithCode(0), "");
}

} // namespace
} // namespace tavi
