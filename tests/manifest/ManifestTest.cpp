#include <future>
#include <map>
#include <random>

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
        for (ManifestRef kept[2]; !isDone; std::swap(kept[0], kept[1])) { // one is kept beyond a replacement
            kept[0] = published.acquire();
            for (const ManifestRef& manifest : kept)
                ASSERT_TRUE(!manifest || manifest->hash() == std::to_string(manifest->patches(0)[0].timestamp()));
        }
    };
    const auto start = [&] { return std::async(std::launch::async, read); };
    const std::future<void> readers[] = {start(), start(), start()}; // join on destruction
    for (int version = 1; version <= 400; ++version)
        published.replace(
            Manifest::parse(wxString::Format("USER\n_hash|%d\n\n\nFILES\na\n%d:::::::", version, version)));
    isDone = true;
}

// Uses few characters, so that paths, folders and prefixes coincide. Only 16-bit wide characters have surrogates.
std::wstring randomPath(std::mt19937& random, std::size_t longest)
{
    const wchar_t characters[] = {'a', 'b', '\\', '\\', 0xE4, 0x65E5, 0xFFFD, 0xD83D, 0xD83D, 0xDE00, 0xDE01, 0xDFFF};
    std::wstring path(random() % (longest + 1), 0);
    for (wchar_t& character : path)
        character = characters[random() % (sizeof(wchar_t) == 2 ? 12 : 7)];
    return path;
}

bool existed(const ManifestPatchList& patches, std::uint32_t time)
{
    bool exists = false;
    for (std::size_t i = 0; i < patches.size(); ++i)
        exists = time == 0 || patches[i].timestamp() <= time ? !patches[i].isDeletion() : exists;
    return exists || time == kAnyTime;
}

// Adds the versions of each path to the model, as dump() writes them. A large text has more than a block of everything,
// and lines longer than a block or a read.
std::string randomText(std::mt19937& random, bool isLarge, std::map<std::wstring, std::string>& model)
{
    std::string text = "FILES";
    for (std::size_t files = isLarge ? 40000 : 1 + random() % 300; files-- > 0;) {
        const std::size_t extra = isLarge && files == 10000 ? 1500000 : 0;
        const std::wstring path = L"C" + std::wstring(extra, L'd') + randomPath(random, isLarge ? 15 : 7);
        text += (random() % 20 == 0 && !model.empty() ? "\n\nFILES\n" : "\n") + toUtf8(path) + "\n";
        std::string& versions = model[path] = "";
        for (std::size_t count = 1 + random() % 3; count-- > 0;) {
            const std::string digest = std::to_string(random() % 8) + "123456789abcdef0123456789abcdef01234567";
            const std::string aux = extra != 0 ? std::string(extra, 'o') : random() % 4 == 0 ? "odd" : digest;
            const char* const size = random() % 4 == 0 ? ":1:2:-1:0:" : ":1:2:3:0:";
            versions += std::to_string(random() % 50) + size + aux + ":0:40 ";
        }
        text += versions;
        std::replace(text.end() - static_cast<std::ptrdiff_t>(versions.size()), text.end(), ' ', '\n');
    }
    text.pop_back();
    return text;
}

TEST(Manifest, AnswersAsAWalkOverAllEntriesDoes)
{
    std::mt19937 random(20261121);
    for (int round = 0; round < 60; ++round) {
        std::map<std::wstring, std::string> model;
        const std::string text = randomText(random, round == 0, model);
        const ManifestRef manifest = stored(packed(text));
        ASSERT_EQ(dump(Manifest::parse(fromUtf8(text))), dump(manifest));
        ASSERT_EQ(manifest->fileCount(), model.size());
        std::vector<std::wstring> order;
        for (std::uint32_t file = 0; file < manifest->fileCount(); ++file) {
            order.push_back(manifest->filePath(file).ToStdWstring());
            EXPECT_EQ(dump(manifest->findPatches(order.back()).value()), model[order.back()]);
        }
        for (int question = 0; question < (round == 0 ? 30 : 300); ++question) {
            const std::wstring prefix = question == 0 ? L"" : L"C" + randomPath(random, 5);
            const std::uint32_t time = random() % 3 == 0 ? kAnyTime : random() % 60 * (random() % 2);
            std::vector<std::uint32_t> expected, visited;
            for (std::uint32_t file = 0; file < order.size(); ++file) {
                if (order[file].compare(0, prefix.size(), prefix) == 0)
                    expected.push_back(file);
            }
            manifest->forEachUnder(prefix, [&](std::uint32_t file) { return visited.push_back(file), true; });
            ASSERT_EQ(visited, expected);
            const auto didExist = [&](std::uint32_t file) { return existed(manifest->patches(file), time); };
            ASSERT_EQ(manifest->hasBackedUpUnder(prefix, time),
                      std::any_of(expected.begin(), expected.end(), didExist));
            const auto patches = manifest->findPatches(prefix);
            ASSERT_EQ(patches.has_value(), model.count(prefix) != 0);
            ASSERT_EQ(manifest->isBackedUp(prefix, time), patches && existed(*patches, time));
        }
    }
}

} // namespace
} // namespace tavi
