#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <random>
#include <thread>

#include "core/PublishedPointer.h"
#include "tests/backupset/ManifestSupport.h"

namespace tavi {
namespace {

using namespace test;

TEST(Manifest, ExistenceAtATime)
{
    const ManifestRef manifest = held(Manifest::Parse("FILES\nC:\\kept\n10:1:5:0::0\n20:1:6:0::0\n\nC:\\deleted\n10:1:"
                                                      "5:0::0\n20:1:-1:0::0\n\nC:\\back\n10:1:-1:0::0\n20:1:5:0::0"));
    const std::tuple<const wchar_t*, std::uint32_t, bool> cases[] = {
        {L"C:\\kept", 9, false},          {L"C:\\kept", 10, true},        {L"C:\\kept", 0, true},
        {L"C:\\kept", kAnyTime, true},    {L"c:\\kept", kAnyTime, false}, {L"C:\\deleted", 15, true},
        {L"C:\\deleted", 20, false},      {L"C:\\deleted", 0, false},     {L"C:\\deleted", kAnyTime - 1, false},
        {L"C:\\deleted", kAnyTime, true}, {L"C:\\back", 19, false},       {L"C:\\back", 20, true}};
    for (const auto& [path, time, backedUp] : cases)
        EXPECT_EQ(manifest->IsBackedUp(path, time), backedUp) << path << " at " << time;
    // As a version of the file, not as a question about it, the last time is one like any other.
    EXPECT_FALSE(manifest->FindPatches(L"C:\\deleted")->existsAt(kAnyTime));
    EXPECT_EQ(manifest->FindPatches(L"C:\\kept")->decidingAt(15), std::size_t{0});
    EXPECT_EQ(manifest->FindPatches(L"C:\\kept")->decidingAt(9), std::nullopt);
}

// Readers keep references beyond later swaps; each manifest they hold must be whole.
TEST(Manifest, StaysWholeForItsReadersWhileOthersReplaceIt)
{
    PublishedPointer<const Manifest> published;
    std::atomic<bool> done{false};
    std::vector<std::thread> readers;
    for (int reader = 0; reader < 3; ++reader)
        readers.emplace_back([&] {
            std::vector<ManifestRef> kept(4);
            for (std::size_t turn = 0; !done; ++turn) {
                kept[turn % kept.size()] = ManifestRef(published.acquire());
                for (const ManifestRef& manifest : kept) {
                    const auto patches = manifest ? manifest->FindPatches(L"C:\\a") : std::nullopt;
                    ASSERT_TRUE(!manifest || patches);
                    ASSERT_TRUE(!manifest || utf8(manifest->hash()) == std::to_string((*patches)[0].timestamp()));
                }
            }
        });
    for (int version = 1; version <= 400; ++version) {
        const std::string number = std::to_string(version);
        const Manifest* const next =
            Manifest::Parse(fromUtf8("USER\n_hash|" + number + "\n\n\nFILES\nC:\\a\n" + number + ":1:2:3:0:x:0:40"));
        next->AddRef();
        published.replace(next);
    }
    done = true;
    for (std::thread& reader : readers)
        reader.join();
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

// The first round has more than a block of everything, and lines longer than a block or a read.
TEST(Manifest, AnswersAsAWalkOverAllEntriesDoes)
{
    std::mt19937 random(20261121);
    for (int round = 0; round < 60; ++round) {
        const bool large = round == 0;
        std::map<std::u16string, std::string> model;
        std::wstring text = L"FILES";
        for (std::size_t files = large ? 20000 : random() % 300; files-- > 0;) {
            const bool longLines = large && files == 10000;
            if (random() % 20 == 0 && text.back() == L'\n')
                text += L"\n\nFILES";
            const std::wstring path =
                L"C" + std::wstring(longLines ? 1500000 : 0, L'd') + randomPath(random, large ? 15 : 7);
            std::string versions;
            for (std::size_t count = 1 + random() % 3; count-- > 0;) {
                const std::string time = std::to_string(random() % 50);
                const std::string size = std::to_string(static_cast<int>(random() % 4) - 1);
                const std::string digest = std::string(32, 'a') + std::to_string(10000000 + random() % 90000000);
                const std::string aux = longLines ? std::string(1500000, 'o') : random() % 4 == 0 ? "odd" : digest;
                versions += time + ":1:2:" + size + ":0:" + aux + ":0:40 ";
            }
            std::wstring lines(versions.begin(), versions.end());
            std::replace(lines.begin(), lines.end(), L' ', L'\n');
            text += L"\n" + path + L"\n" + lines;
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

        std::vector<std::u16string> order;
        auto left = model;
        for (std::uint32_t file = 0; file < manifest->fileCount(); ++file) {
            const wxString path = manifest->filePath(file);
            order.push_back(utf16(path));
            const auto found = manifest->FindPatches(view(path));
            ASSERT_TRUE(found);
            EXPECT_EQ(dump(*found), left[order.back()]);
            left.erase(order.back());
        }
        ASSERT_TRUE(left.empty());
        EXPECT_GE(manifest->residentBytes(), order.size() * sizeof(storage::PackedVersion));
        for (int question = 0; question < (large ? 30 : 300); ++question) {
            const std::wstring wide = question == 0 ? L"" : L"C" + randomPath(random, 5);
            const std::u16string prefix = utf16(wide);
            const std::uint32_t time = random() % 3 == 0 ? kAnyTime : random() % 60;
            std::vector<std::uint32_t> expected, visited;
            bool backedUp = false;
            for (std::uint32_t file = 0; file < order.size(); ++file) {
                if (order[file].compare(0, prefix.size(), prefix) == 0) {
                    expected.push_back(file);
                    backedUp = backedUp || time == kAnyTime || manifest->patches(file).existsAt(time);
                }
            }
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

} // namespace
} // namespace tavi
