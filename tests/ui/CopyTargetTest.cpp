#include "ui/CopyTarget.h"

#include <gtest/gtest.h>

#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(CopyTarget, SharesWholeComponentsAndFindsTargetsInTheFolder)
{
    const test::TemporaryFolder folder;
    const wxString deep = L"C:\\" + wxString(L'd', 300);
    std::filesystem::create_directory(folder.path() + L"\\x");
    const std::tuple<PathSet, wxString, bool> cases[] = {
        {{}, L"", false},
        {{L"C:\\a\\none"}, L"C:\\a\\none", true}, // the target is the folder itself
        {{L"C:\\a\\xx", L"C:\\a\\xy"}, L"C:\\a", false},
        {{L"C:\\a", L"C:\\a\\X"}, L"C:\\a", true},
        {{L"C:\\Dir\\N", L"c:\\dIR\\m"}, L"C:\\Dir", false},
        {{L"C:\\n", L"D:\\n"}, L"", false},
        {{L"C:\\a\\x", L"C:\\a\\b\\n", L"C:\\a\\b\\m"}, L"C:\\a", true},
        {{L"C:\\a\\b\\n", L"C:\\a\\b\\m", L"C:\\a\\x"}, L"C:\\a", true},
        {{deep + L"\\n", deep + L"\\m"}, deep, false},
    };
    for (const auto& [paths, prefix, exists] : cases) {
        EXPECT_TRUE(commonPrefix(paths).IsSameAs(prefix, false)) << commonPrefix(paths) << " for " << prefix;
        EXPECT_EQ(anyTargetExists(paths, prefix, folder.path() + L"\\"), exists) << prefix;
    }
}

} // namespace
} // namespace tavi
