#include <map>
#include <random>

#include <gtest/gtest.h>

#include "tests/backupset/PathTreeModel.h"

namespace tavi {
namespace {

struct Held {
    explicit Held(EntryCounter counter, bool foldersOnly = false)
        : tree(PathTree::Create(foldersOnly, std::move(counter)))
    {
        tree->AddRef();
    }
    ~Held()
    {
        tree->Release();
    }
    PathTree* operator->() const
    {
        return tree;
    }
    PathTree* tree;
};

TEST(PathTree, AnswersAsAnObviousModelDoes)
{
    std::mt19937 random(20260714);
    std::vector<std::wstring> paths = {L"a", L"b", L"c"};
    for (std::size_t i = 0; i < 40; ++i) {
        for (const wchar_t* const name : {L"\\a", L"\\b", L"\\c"})
            paths.push_back(paths[i] + name);
    }
    for (int set = 0; set < 6000; ++set) {
        // How many entries a folder has: none at all, fewer than there are names, as many, or more.
        const std::size_t seed = random();
        const EntryCounter counter = [seed](const wxString& folder, bool) {
            return static_cast<std::uint32_t>((std::hash<std::wstring>()(folder.ToStdWstring()) ^ seed) % 1009 % 5);
        };
        Held tree(counter);
        test::PathTreeModel model(counter);
        std::string rules;
        for (unsigned rule = 0, count = random() % 12 + 1; rule < count; ++rule) {
            const std::wstring& path = paths[random() % paths.size()];
            const PathState state = random() % 3 == 0 ? random() % 10 : random() % 2 * 7;
            tree->Insert(path, state);
            model.insert(path, state);
            rules += wxString(path).utf8_string() + "=" + std::to_string(state) + " ";
        }
        for (const std::wstring& path : paths)
            ASSERT_EQ(tree->Lookup(path), model.lookup(path)) << wxString(path).utf8_string() << " of " << rules;
    }
}

TEST(PathTree, KeepsItsRulesInPlainCases)
{
    using Rules = std::vector<std::pair<const wchar_t*, PathState>>;
    const struct {
        Rules rules;
        std::uint32_t entries;
        Rules answers;
    } cases[] = {
        {{{L"C:\\A", 0}}, 5, {{L"C:", 8}, {L"C:\\A", 8}, {L"", 0}}},
        {{{L"C:\\A", 7}}, 5, {{L"C:", 2}, {L"C:\\", 2}, {L"C:\\B", 8}, {L"C:\\A\\x", 7}, {L"C:\\A", 7}, {L"c:\\A", 8}}},
        {{{L"C:\\X", 7}, {L"C:\\X\\Y", 0}}, 5, {{L"C:\\X", 5}, {L"C:\\X\\Z", 7}, {L"C:\\X\\Y\\z", 8}}},
        {{{L"C:\\X", 7}, {L"C:\\X\\Y", 0}}, 0, {{L"C:\\X", 7}, {L"C:\\X\\Z", 7}}}, // listed as empty
        {{{L"C:\\X\\Y", 7}, {L"C:\\X", 0}}, 5, {{L"C:\\X\\Y", 8}, {L"C:\\X", 0}}},
        {{{L"C:\\X", 7}, {L"C:\\Y", 7}}, 2, {{L"C:", 6}, {L"C:\\Z", 6}}},
        {{{L"", 7}}, 5, {{L"", 0}, {L"\\x", 7}, {L"x", 8}}},
    };
    for (const auto& test : cases) {
        std::map<wxString, int> counted;
        Held tree(
            [&](const wxString& folder, bool foldersOnly) {
                EXPECT_TRUE(foldersOnly);
                ++counted[folder];
                return test.entries;
            },
            true);
        for (const auto& [path, state] : test.rules)
            tree->Insert(path, state);
        for (const auto& [path, state] : test.answers)
            EXPECT_EQ(tree->Lookup(path), state) << wxString(path).utf8_string();
        for (const auto& [folder, times] : counted)
            EXPECT_EQ(times, 1) << folder.utf8_string();
    }
    // As deep as a path can be: neither filling nor freeing goes by recursion.
    Held deep([](const wxString&, bool) { return 0u; });
    std::wstring path(60000, L'\\');
    path[0] = L'x';
    deep->Insert(path.substr(0, 2000), 7);
    EXPECT_EQ(deep->Lookup(path), 7u);
}

} // namespace
} // namespace tavi
