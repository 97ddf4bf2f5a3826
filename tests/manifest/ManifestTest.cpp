#include <map>
#include <random>
#include <thread>

#include <gtest/gtest.h>

#include "core/PublishedPointer.h"
#include "tests/manifest/ManifestSupport.h"

namespace tavi {
namespace {

using namespace test;

TEST(Manifest, StaysWholeForItsReadersWhileOthersReplaceIt)
{
    PublishedPointer<const Manifest> published;
    std::atomic<bool> isDone{false};
    const auto read = [&] {
        std::vector<ManifestRef> kept(4); // beyond later replacements
        for (std::size_t turn = 0; !isDone; ++turn) {
            kept[turn % kept.size()] = published.acquire();
            for (const ManifestRef& manifest : kept)
                ASSERT_TRUE(!manifest || utf8(manifest->hash()) == std::to_string(manifest->patches(0)[0].timestamp()));
        }
    };
    std::thread readers[] = {std::thread(read), std::thread(read), std::thread(read)};
    for (int version = 1; version <= 400; ++version) {
        const std::string number = std::to_string(version);
        published.replace(
            Manifest::parse(fromUtf8("USER\n_hash|" + number + "\n\n\nFILES\nC:\\a\n" + number + ":1:2:3:0:x:0:40")));
    }
    isDone = true;
    for (std::thread& reader : readers)
        reader.join();
}

// Converts to UTF-8 with surrogates in three-byte form, so that every prefix in UTF-16 is a prefix in bytes too.
std::string inHalves(const wxString& text)
{
    std::string bytes;
    for (const wchar_t unit : view(text)) {
        const auto point = static_cast<char32_t>(unit);
        if (point >= 0x10000)
            appendUtf8(std::wstring(1, static_cast<wchar_t>(0xD7C0 + (point >> 10))), bytes);
        appendUtf8(std::wstring(1, static_cast<wchar_t>(point >= 0x10000 ? 0xDC00 + (point & 0x3FF) : point)), bytes);
    }
    return bytes;
}

// Uses few characters, so that paths, folders and prefixes coincide. Surrogates are among them.
std::wstring randomPath(std::mt19937& random, std::size_t longest)
{
    constexpr wchar_t kCharacters[] = {L'a',   L'b',   L'\\',  L'\\',  0xE4,   0x65E5,
                                       0xFFFD, 0xD83D, 0xD83D, 0xDE00, 0xDE01, 0xDFFF};
    std::wstring path;
    for (std::size_t length = random() % (longest + 1); path.size() < length;)
        path.push_back(kCharacters[random() % std::size(kCharacters)]);
    return path;
}

bool existed(const ManifestPatchList& patches, std::uint32_t time)
{
    bool exists = time == kAnyTime;
    for (std::size_t i = 0; i < patches.size(); ++i)
        exists = time == kAnyTime || (time != 0 && patches[i].timestamp() > time) ? exists : !patches[i].isDeletion();
    return exists;
}

// The versions of each path, as dump() writes them.
using Model = std::map<std::string, std::string>;

// A large text has more than a block of everything, and lines longer than a block or a read.
std::wstring randomText(std::mt19937& random, bool isLarge, Model& model)
{
    std::wstring text = L"FILES";
    for (std::size_t files = isLarge ? 20000 : random() % 300; files-- > 0;) {
        const std::size_t extra = isLarge && files == 10000 ? 1500000 : 0;
        if (random() % 20 == 0 && text.back() == L'\n')
            text += L"\n\nFILES";
        const std::wstring path = L"C" + std::wstring(extra, L'd') + randomPath(random, isLarge ? 15 : 7);
        text += L"\n" + path + L"\n";
        std::string& versions = model[inHalves(path)] = "";
        for (std::size_t count = 1 + random() % 3; count-- > 0;) {
            const std::string time = std::to_string(random() % 50);
            const std::string size = std::to_string(static_cast<int>(random() % 4) - 1);
            const std::string digest = std::string(32, 'a') + std::to_string(10000000 + random() % 90000000);
            const std::string aux = extra != 0 ? std::string(extra, 'o') : random() % 4 == 0 ? "odd" : digest;
            const std::string version = time + ":1:2:" + size + ":0:" + aux + ":0:40";
            text += std::wstring(version.begin(), version.end()) + L"\n";
            versions += version + " ";
        }
    }
    if (text.back() == L'\n')
        text.pop_back();
    return text;
}

TEST(Manifest, AnswersAsAWalkOverAllEntriesDoes)
{
    std::mt19937 random(20261121);
    for (int round = 0; round < 60; ++round) {
        Model model;
        const std::wstring text = randomText(random, round == 0, model);
        const ManifestRef manifest = Manifest::parse(text);
        ASSERT_EQ(dump(stored(packed(inHalves(text)))), dump(manifest)) << "characters stored in halves";
        ASSERT_EQ(manifest->fileCount(), model.size());
        std::vector<std::string> order;
        for (std::uint32_t file = 0; file < manifest->fileCount(); ++file) {
            const wxString path = manifest->filePath(file);
            order.push_back(inHalves(path));
            EXPECT_EQ(dump(manifest->findPatches(view(path)).value()), model[order.back()]);
        }
        for (int question = 0; question < (round == 0 ? 30 : 300); ++question) {
            const std::wstring wide = question == 0 ? L"" : L"C" + randomPath(random, 5);
            const std::string prefix = inHalves(wide);
            const std::uint32_t time = random() % 3 == 0 ? kAnyTime : random() % 60 * (random() % 2);
            std::vector<std::uint32_t> expected, visited;
            bool isBackedUp = false, isFileBackedUp = false;
            for (std::uint32_t file = 0; file < order.size(); ++file) {
                if (order[file].compare(0, prefix.size(), prefix) == 0) {
                    expected.push_back(file);
                    const bool exists = existed(manifest->patches(file), time);
                    isBackedUp = isBackedUp || exists;
                    isFileBackedUp = isFileBackedUp || (exists && order[file] == prefix);
                }
            }
            manifest->forEachUnder(wide, [&](std::uint32_t file) {
                visited.push_back(file);
                return true;
            });
            ASSERT_EQ(visited, expected);
            ASSERT_EQ(manifest->hasBackedUpUnder(wide, time), isBackedUp);
            ASSERT_EQ(manifest->isBackedUp(wide, time), isFileBackedUp);
        }
    }
}

} // namespace
} // namespace tavi
