#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <random>
#include <thread>

#include "core/PublishedPointer.h"
#include "tests/manifest/ManifestSupport.h"

namespace tavi {
namespace {

using namespace test;

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
                kept[turn % kept.size()] = published.acquire();
                for (const ManifestRef& manifest : kept)
                    ASSERT_TRUE(!manifest ||
                                utf8(manifest->hash()) == std::to_string(manifest->patches(0)[0].timestamp()));
            }
        });
    for (int version = 1; version <= 400; ++version) {
        const std::string number = std::to_string(version);
        published.replace(
            Manifest::parse(fromUtf8("USER\n_hash|" + number + "\n\n\nFILES\nC:\\a\n" + number + ":1:2:3:0:x:0:40")));
    }
    done = true;
    for (std::thread& reader : readers)
        reader.join();
}

// UTF-8 with the halves of every character apart: what is a prefix in UTF-16 is one here too.
std::string inHalves(const wxString& text)
{
    std::wstring units;
    for (const wchar_t unit : view(text)) {
        const auto point = static_cast<char32_t>(unit);
        if (point >= 0x10000)
            units.push_back(static_cast<wchar_t>(0xD7C0 + (point >> 10)));
        units.push_back(static_cast<wchar_t>(point >= 0x10000 ? 0xDC00 + (point & 0x3FF) : point));
    }
    std::string bytes;
    for (const wchar_t unit : units)
        appendUtf8({&unit, 1}, bytes);
    return bytes;
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

// Tells by a file's versions, each as "time:1:2:size:...", whether it is backed up at a time.
bool existed(const std::string& versions, std::uint32_t time)
{
    std::istringstream all(versions);
    bool exists = time == kAnyTime;
    for (std::string version; time != kAnyTime && all >> version;) {
        if (time == 0 || std::stoul(version) <= time)
            exists = version.find(":1:2:-1:") == std::string::npos;
    }
    return exists;
}

// The first round has more than a block of everything, and lines longer than a block or a read.
TEST(Manifest, AnswersAsAWalkOverAllEntriesDoes)
{
    std::mt19937 random(20261121);
    for (int round = 0; round < 60; ++round) {
        const bool large = round == 0;
        std::map<std::string, std::string> model;
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
            model[inHalves(path)] = versions;
        }
        if (text.back() == L'\n')
            text.pop_back();
        // Stored, with the halves of every character apart, the text is still the same.
        const ManifestRef manifest = Manifest::parse(text);
        ASSERT_EQ(dump(stored(packed(inHalves(text)))), dump(manifest));
        ASSERT_EQ(manifest->fileCount(), model.size());

        std::vector<std::string> order;
        for (std::uint32_t file = 0; file < manifest->fileCount(); ++file) {
            const wxString path = manifest->filePath(file);
            order.push_back(inHalves(path));
            EXPECT_EQ(dump(manifest->findPatches(view(path)).value()), model[order.back()]);
        }
        for (int question = 0; question < (large ? 30 : 300); ++question) {
            const std::wstring wide = question == 0 ? L"" : L"C" + randomPath(random, 5);
            const std::string prefix = inHalves(wide);
            const std::uint32_t time = random() % 3 == 0 ? kAnyTime : random() % 60 * (random() % 2);
            std::vector<std::uint32_t> expected, visited;
            bool backedUp = false;
            for (std::uint32_t file = 0; file < order.size(); ++file) {
                if (order[file].compare(0, prefix.size(), prefix) == 0) {
                    expected.push_back(file);
                    backedUp = backedUp || existed(model[order[file]], time);
                }
            }
            manifest->forEachUnder(wide, [&](std::uint32_t file) {
                visited.push_back(file);
                return true;
            });
            ASSERT_EQ(visited, expected);
            ASSERT_EQ(manifest->hasBackedUpUnder(wide, time), backedUp);
            ASSERT_EQ(manifest->isBackedUp(wide, time), model.count(prefix) == 1 && existed(model[prefix], time));
        }
    }
}

} // namespace
} // namespace tavi
