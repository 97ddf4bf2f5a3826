#include "core/Paths.h"

#include <windows.h>
#include <gtest/gtest.h>

#include "tests/support/Registry.h"

TEST(longPath, IsTheLongFormWithAnUpperCaseDriveLetterOrEmpty)
{
    const tavi::test::TemporaryFolder folder;
    wchar_t shortPath[MAX_PATH];
    GetShortPathNameW(folder.path().c_str(), shortPath, MAX_PATH);
    EXPECT_NE(shortPath, folder.path());
    shortPath[0] = L'c';
    const wxString path = tavi::longPath(shortPath);
    EXPECT_TRUE(path[0] == L'C' && path.IsSameAs(folder.path(), false)) << path.utf8_string();
    EXPECT_EQ(tavi::longPath(folder.path() + L"\\missing"), L"");
}
