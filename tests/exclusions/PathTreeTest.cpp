#include "exclusions/PathTree.h"

#include <random>

#include <gtest/gtest.h>

#include "fuzz/PathTreeModel.h"

using namespace tavi;

using namespace std::string_literals;

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
            ASSERT_EQ(tree->lookup(path), FolderState{model.lookup(path)}) << wxString(path) << " of set " << set;
    }
}

TEST(PathTree, TakesOddAndVeryLongPaths)
{
    const RefPtr<PathTree> tree =
        PathTree::create(true, [](const wxString&, bool foldersOnly) { return foldersOnly ? 5u : 0u; });
    const std::wstring deep = L"y" + std::wstring(60000, L'\\');
    for (const std::wstring& path : {L"C:\\A"s, L"C:\\B"s, L"C:\\B\\x"s, L""s, deep.substr(0, 2000)})
        tree->insert(path, FolderState::allOn);
    EXPECT_EQ(tree->lookup(L""), FolderState::off);
    EXPECT_EQ(tree->lookup(L"x"), FolderState::allOff);
    EXPECT_EQ(tree->lookup(L"\\x"), FolderState::allOn);
    EXPECT_EQ(tree->lookup(L"C:\\"), FolderState::offSomeOn);
    EXPECT_EQ(tree->lookup(L"c:\\A"), FolderState::allOff);
    EXPECT_EQ(tree->lookup(deep), FolderState::allOn);
}
