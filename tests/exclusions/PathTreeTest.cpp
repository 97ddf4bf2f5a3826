#include "exclusions/PathTree.h"

#include <random>

#include <gtest/gtest.h>

#include "fuzz/PathTreeModel.h"

namespace tavi {
namespace {

TEST(PathTree, AnswersAsTheModelDoes)
{
    std::mt19937 random(20260714);
    std::vector<std::wstring> paths = {L"a", L"b", L"c"};
    for (std::size_t i = 0; i < 40; ++i) {
        for (const wchar_t* const name : {L"\\a", L"\\b", L"\\c"})
            paths.push_back(paths[i] + name);
    }
    for (int set = 0; set < 6000; ++set) {
        const EntryCounter counter = test::arbitraryEntryCounts(random());
        const RefPtr<PathTree> tree = PathTree::create(false, counter);
        test::PathTreeModel model(counter);
        for (unsigned rule = 0, count = random() % 12 + 1; rule < count; ++rule) {
            const std::wstring& path = paths[random() % paths.size()];
            const std::uint32_t state = random() % 3 == 0 ? random() % 10 : random() % 2 * 7;
            tree->insert(path, FolderState{state});
            model.insert(path, state);
        }
        for (const std::wstring& path : paths)
            ASSERT_EQ(tree->lookup(path), FolderState{model.lookup(path)})
                << wxString(path).utf8_string() << " of set " << set;
    }
}

TEST(PathTree, ComparesOddPathsExactlyAndCountsAFolderOnce)
{
    std::map<wxString, int> counted;
    const RefPtr<PathTree> tree = PathTree::create(true, [&](const wxString& folder, bool foldersOnly) {
        EXPECT_TRUE(foldersOnly);
        ++counted[folder];
        return 5u;
    });
    for (const wchar_t* const path : {L"C:\\A", L"C:\\B", L"C:\\B\\x", L""})
        tree->insert(path, FolderState::allOn);
    EXPECT_EQ(tree->lookup(L""), FolderState::off);
    EXPECT_EQ(tree->lookup(L"x"), FolderState::allOff);
    EXPECT_EQ(tree->lookup(L"\\x"), FolderState::allOn);
    EXPECT_EQ(tree->lookup(L"C:\\"), FolderState::offSomeOn);
    EXPECT_EQ(tree->lookup(L"c:\\A"), FolderState::allOff);
    EXPECT_EQ(counted, (std::map<wxString, int>{{L"C:", 1}, {L"C:\\B", 1}}));
}

TEST(PathTree, TakesAndFreesPathsOfManyComponents)
{
    const RefPtr<PathTree> tree = PathTree::create(false, [](const wxString&, bool) { return 0u; });
    std::wstring path(60000, L'\\');
    path[0] = L'x';
    tree->insert(path.substr(0, 2000), FolderState::allOn);
    EXPECT_EQ(tree->lookup(path), FolderState::allOn);
}

} // namespace
} // namespace tavi
