#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <random>

#include "tests/backupset/ManifestSupport.h"

namespace tavi {
namespace {

using namespace test;

TEST(Manifest, ExistenceAtATime)
{
    const ManifestRef manifest = held(Manifest::Parse("FILES\nC:\\kept\n10:1:5:0::0\n20:1:6:0::0\n\nC:\\deleted\n10:1:"
                                                      "5:0::0\n20:1:-1:0::0\n\nC:\\back\n10:1:-1:0::0\n20:1:5:0::0"));
    const struct {
        const wchar_t* path;
        std::uint32_t time;
        bool backedUp;
    } cases[] = {
        {L"C:\\kept", 9, false},          {L"C:\\kept", 10, true},       {L"C:\\kept", 19, true},
        {L"C:\\kept", 0, true},           {L"C:\\kept", kAnyTime, true}, {L"C:\\deleted", 15, true},
        {L"C:\\deleted", 20, false},      {L"C:\\deleted", 0, false},    {L"C:\\deleted", kAnyTime - 1, false},
        {L"C:\\deleted", kAnyTime, true}, {L"C:\\back", 19, false},      {L"C:\\back", 20, true},
        {L"c:\\kept", kAnyTime, false},   {L"C:\\kep", kAnyTime, false}, {L"C:\\", kAnyTime, false},
        {L"", kAnyTime, false},
    };
    for (const auto& test : cases)
        EXPECT_EQ(manifest->IsBackedUp(test.path, test.time), test.backedUp) << test.path << " at " << test.time;
    // As a version of the file, not as a question about it, the last time is one like any other.
    EXPECT_FALSE(manifest->FindPatches(L"C:\\deleted")->existsAt(kAnyTime));
    EXPECT_EQ(manifest->FindPatches(L"C:\\kept")->decidingAt(15), std::size_t{0});
    EXPECT_EQ(manifest->FindPatches(L"C:\\kept")->decidingAt(9), std::nullopt);
    EXPECT_TRUE(manifest->HasBackedUpUnder(L"C:\\de", 15));
    EXPECT_FALSE(manifest->HasBackedUpUnder(L"C:\\de", 25));
    EXPECT_TRUE(manifest->HasBackedUpUnder(L"", kAnyTime));
    EXPECT_FALSE(held(Manifest::Parse(wxString()))->HasBackedUpUnder(L"", kAnyTime));
}

std::u16string utf16(const wxString& text)
{
    std::u16string out;
    for (const wchar_t unit : view(text)) {
        const auto point = static_cast<char32_t>(unit);
        if (point >= 0x10000)
            out.push_back(static_cast<char16_t>(0xD7C0 + (point >> 10)));
        out.push_back(static_cast<char16_t>(point >= 0x10000 ? 0xDC00 + (point & 0x3FF) : point));
    }
    return out;
}

// Few characters, so that paths, folders and prefixes meet; halves of characters among them.
std::wstring randomPath(std::mt19937& random, std::size_t longest)
{
    constexpr wchar_t kCharacters[] = {L'a',   L'b',   L'\\',  L'\\',  0xE4,   0x65E5,
                                       0xFFFD, 0xD83D, 0xD83D, 0xDE00, 0xDE01, 0xDFFF};
    std::wstring path;
    for (std::size_t length = random() % (longest + 1); path.size() < length;)
        path.push_back(kCharacters[random() % std::size(kCharacters)]);
    return path;
}

TEST(Manifest, AnswersAsAWalkOverAllEntriesDoes)
{
    std::mt19937 random(20261121);
    for (int round = 0; round < 60; ++round) {
        std::map<std::u16string, std::string> model;
        std::wstring text = L"FILES";
        for (std::size_t files = random() % 300; files-- > 0;) {
            if (random() % 20 == 0 && text.back() == L'\n')
                text += L"\n\nFILES";
            const std::wstring path = L"C" + randomPath(random, 7);
            text += L"\n" + path;
            std::string versions;
            for (std::size_t count = 1 + random() % 3; count-- > 0;) {
                const std::string size = std::to_string(static_cast<int>(random() % 4) - 1);
                const std::string time = std::to_string(random() % 50);
                const std::string aux = random() % 4 == 0 ? "odd" : "0123456789abcdef0123456789abcdef01234567";
                versions += time + ":1:2:" + size + ":0:" + aux + ":0:40 ";
            }
            std::wstring lines(versions.begin(), versions.end());
            std::replace(lines.begin(), lines.end(), L' ', L'\n');
            text += L"\n" + lines;
            model[utf16(path)] = versions;
        }
        if (text.back() == L'\n')
            text.pop_back();
        // Stored, with the halves of every character apart, the text is still the same.
        const ManifestRef manifest = held(Manifest::Parse(text));
        std::string halves;
        for (const char16_t unit : utf16(text))
            appendUtf8(std::wstring(1, static_cast<wchar_t>(unit)), halves);
        ASSERT_EQ(dump(stored(packed(halves))), dump(manifest));
        ASSERT_EQ(manifest->fileCount(), model.size());

        std::vector<std::u16string> order;
        for (std::uint32_t file = 0; file < manifest->fileCount(); ++file)
            order.push_back(utf16(manifest->filePath(file)));
        for (const auto& [path, versions] : model) {
            const auto found = manifest->FindPatches(view(manifest->filePath(
                static_cast<std::uint32_t>(std::find(order.begin(), order.end(), path) - order.begin()))));
            ASSERT_TRUE(found);
            EXPECT_EQ(dump(*found), versions);
        }
        for (int question = 0; question < 300; ++question) {
            const std::wstring wide = question == 0 ? L"" : L"C" + randomPath(random, 5);
            const std::u16string prefix = utf16(wide);
            const std::uint32_t time = random() % 3 == 0 ? kAnyTime : random() % 60;
            std::vector<std::uint32_t> expected;
            bool backedUp = false;
            for (std::uint32_t file = 0; file < order.size(); ++file) {
                if (order[file].compare(0, prefix.size(), prefix) == 0) {
                    expected.push_back(file);
                    backedUp = backedUp || time == kAnyTime || manifest->patches(file).existsAt(time);
                }
            }
            std::vector<std::uint32_t> visited;
            manifest->forEachUnder(wide, [&](std::uint32_t file) {
                visited.push_back(file);
                return true;
            });
            ASSERT_EQ(visited, expected);
            ASSERT_EQ(manifest->HasBackedUpUnder(wide, time), backedUp);
            ASSERT_EQ(manifest->IsBackedUp(wide, kAnyTime), model.count(prefix) == 1);
        }
    }
}

// More than a block of everything, an entry twice at the far ends, and lines longer than a block or a read.
TEST(Manifest, ManyFilesAndLongLines)
{
    constexpr std::uint32_t kFiles = 70000;
    const std::string deep = "\\\\D\\" + std::string(1500000, 'd') + "\\";
    std::string text = "FILES\n";
    for (std::uint32_t i = 0; i < kFiles; ++i) {
        // Spread, so that neither folders nor names come in order.
        const std::uint32_t n = i * 7919u % kFiles;
        text += "C:\\folder" + std::to_string(n % 40001) + "\\name" + std::to_string(n) + "\n" + std::to_string(n + 1) +
                ":1:2:" + std::to_string(n) + ":0:0123456789abcdef0123456789abcdef" + std::to_string(10000000 + n) +
                ":0:40\n\n";
    }
    text += deep + "a\n1:2:0:" + deep + "\n\nC:\\folder0\\name0\n9:9:9:9:0::0:1";
    const ManifestRef manifest = stored(packed(text));
    ASSERT_TRUE(manifest);
    EXPECT_EQ(manifest->fileCount(), kFiles + 1);
    EXPECT_GT(manifest->residentBytes(), kFiles * sizeof(storage::PackedVersion));
    for (std::uint32_t n = 0; n < kFiles; ++n) {
        const std::string path = "C:\\folder" + std::to_string(n % 40001) + "\\name" + std::to_string(n);
        const auto patches = manifest->FindPatches(view(fromUtf8(path)));
        ASSERT_TRUE(patches) << path;
        ASSERT_EQ(dump(*patches), n == 0 ? "9:9:9:9:0::0:1 "
                                         : std::to_string(n + 1) + ":1:2:" + std::to_string(n) +
                                               ":0:0123456789abcdef0123456789abcdef" + std::to_string(10000000 + n) +
                                               ":0:40 ");
    }
    EXPECT_TRUE(utf8((*manifest->FindPatches(view(fromUtf8(deep + "a"))))[0].auxText()) == deep);
    EXPECT_TRUE(manifest->HasBackedUpUnder(view(fromUtf8(deep)), kAnyTime));
    EXPECT_FALSE(manifest->HasBackedUpUnder(view(fromUtf8(deep + "b")), kAnyTime));
}

TEST(Manifest, ReferencesAreCounted)
{
    // Under the address sanitizer a wrong count is a fault or a leak.
    ManifestRef first = held(Manifest::Parse("FILES\na\n1"));
    ManifestRef second = first;
    ManifestRef third = std::move(first);
    EXPECT_FALSE(first);
    second = third;
    third = ManifestRef();
    second->AddRefs(2);
    second->Release();
    second->Release();
    EXPECT_TRUE(second->IsBackedUp(L"a", kAnyTime));
}

} // namespace
} // namespace tavi
