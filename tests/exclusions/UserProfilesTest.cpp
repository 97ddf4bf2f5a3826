#include "exclusions/UserProfiles.h"

#include <algorithm>
#include <set>

#include <gtest/gtest.h>
#include <wx/filename.h>

#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;
using namespace tavi::test;

namespace {

// Three users who are not logged on, the last without a hive.
struct UserProfiles : testing::Test {
    LogCapture log;
    const TemporaryFolder folder;
    const std::wstring shortPath = L"c" + wxFileName(folder.path()).GetShortPath().ToStdWstring().substr(1);
    const std::map<std::wstring, std::wstring> folders{{L"Cookies", shortPath}, {L"Gone", L"C:\\missing"}};
    const AbsentUser users[3] = {folders, folders, folders};
    const BOOL isHiveDeleted = DeleteFileW(users[2].hiveFile.c_str());
    const KernelHandle token = processToken();
};

TEST_F(UserProfiles, AreReachableFromTheOutermostLoadToItsUnload)
{
    EXPECT_NE(shortPath.substr(1), folder.path().substr(1));
    std::set<std::wstring> names;
    for (const bool isEnabled : {true, false}) {
        setPrivilege(token.get(), L"SeRestorePrivilege", isEnabled);
        loadUserHives();
        const auto loaded = temporaryHives();
        names.insert(loaded.begin(), loaded.end());
        const auto paths = shellFolderPaths(L"Cookies");
        EXPECT_EQ(std::count(paths.begin(), paths.end(), L"C" + folder.path().substr(1)), 2);
        EXPECT_TRUE(shellFolderPaths(L"Gone").empty());
        loadUserHives();
        unloadUserHives();
        EXPECT_EQ(temporaryHives(), loaded) << "after a nested pair";
        unloadUserHives();
        EXPECT_TRUE(temporaryHives().empty());
        EXPECT_EQ(isPrivilegeEnabled(token.get(), L"SeRestorePrivilege"), isEnabled) << "as before";
        EXPECT_FALSE(isPrivilegeEnabled(token.get(), L"SeBackupPrivilege"));
    }
    EXPECT_EQ(names.size(), 4u) << "each load uses new names";
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
    FailingAllocations(0), unloadUserHives();
    EXPECT_TRUE(temporaryHives().empty());
    EXPECT_EQ(log.takeText(), "");
}

} // namespace
