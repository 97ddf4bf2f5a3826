#include <gtest/gtest.h>

#include <random>

#include "tests/backupset/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;
using namespace std::string_literals;

const std::string kHead = "FILES\nfile\n1:2:0:";

// Texts whose last field is the aux text, so that it shows where they end.
std::string auxText(const std::string& blob)
{
    const ManifestRef manifest = stored(blob);
    const auto patches = manifest ? manifest->FindPatches(L"file") : std::nullopt;
    return patches ? utf8((*patches)[0].auxText()) : "none";
}

TEST(StoredManifest, TheTextEndsAtTheFirstFault)
{
    const struct {
        std::string bytes, text;
    } cases[] = {
        {"ab", "ab"},
        {"a\xC2\x80\xE0\xA0\x80\xF0\x90\x80\x80z", "a\xC2\x80\xE0\xA0\x80\xF0\x90\x80\x80z"},
        {"a\xF4\x8F\xBF\xBF\xED\x9F\xBF\xED\xA0\x80z", "a\xF4\x8F\xBF\xBF\xED\x9F\xBF\xED\xA0\x80z"},
        {"a\xC1\xBFz", "a"},
        {"a\xE0\x9F\xBFz", "a"},
        {"a\xF0\x8F\xBF\xBFz", "a"},
        {"a\xF4\x90\x80\x80z", "a"},
        {"a\x80z", "a"},
        {"a\xFFz", "a"},
        {"a\xFB\xBF\xBF\xBF\xBFz", "a"},
        {"a\xE6\x97zz", "a"},
        {"a\xC3\xC3\xA4", "a"},
        {"a\0b\0z"s, "a"},
        {"a\0\xFFz"s, "a"},
    };
    for (const auto& test : cases) {
        EXPECT_EQ(auxText(packed(kHead + test.bytes)), test.text) << test.bytes;
        // Far behind the first write, at every place of the machine's word.
        for (std::size_t shift = 0; shift < 4; ++shift) {
            const std::string before(100000 + shift, 'x');
            EXPECT_EQ(auxText(packed(kHead + before + test.bytes)), before + test.text) << test.bytes;
        }
        EXPECT_EQ(auxText(packed(kHead + "clean")), "clean") << "left behind by " << test.bytes;
    }
}

TEST(StoredManifest, ACharacterCutByAWriteGoesOnInTheNext)
{
    for (const std::string whole : {"\xC3\xA4", "\xE6\x97\xA5", "\xF0\x9F\x98\x80"}) {
        for (std::size_t behind = 1; behind <= whole.size(); ++behind) {
            const std::string text = std::string(64 * 1024 - kHead.size() - behind, 'x') + whole + "end";
            EXPECT_EQ(auxText(packed(kHead + text)), text);
        }
        // What one text leaves behind begins the next; a text from elsewhere neither takes nor clears it.
        for (std::size_t cut = 1; cut < whole.size(); ++cut) {
            EXPECT_EQ(auxText(packed(kHead + "a" + whole.substr(0, cut))), "a");
            EXPECT_EQ(dump(held(Manifest::Parse("FILES\nb\n1"))), "b = 0:1:0:0:0::0:0 ");
            const ManifestRef next = stored(packed(whole.substr(cut) + "x\n\n\n" + kHead + "b"));
            EXPECT_EQ(next->fileCount(), 1u);
            EXPECT_EQ(next->textLength(), (whole.size() == 4 ? 2u : 1u) + 4 + kHead.size() + 1 + 1);

            // Also from behind a zero; and what does not go on ends the next text at once, and is gone with it.
            EXPECT_EQ(auxText(packed(kHead + "a\0"s + whole.substr(0, cut))), "a");
            EXPECT_EQ(stored(packed(kHead + "b"))->textLength(), 1u);
            EXPECT_EQ(auxText(packed(kHead + "b")), "b");
        }
    }
}

TEST(StoredManifest, NothingBehindAZeroIsOfTheText)
{
    const std::string behind = std::string(100000, 'x') + "\xC3\xA4\n1:2:3:4:5:6:7:8:9\n\n\nFILES\nother\n1";
    const ManifestRef manifest = stored(packed(kHead + "a\0\xC3\xA4"s + behind));
    ASSERT_TRUE(manifest);
    EXPECT_EQ(manifest->fileCount(), 1u);
    EXPECT_EQ(manifest->textLength(), kHead.size() + 1 + 1);
}

TEST(StoredManifest, HeadersAndBrokenBlobs)
{
    LogCapture log;
    EXPECT_EQ(auxText(packed(kHead + "zlib")), "zlib");
    EXPECT_EQ(auxText(packed(kHead + "gzip", 31)), "gzip");
    EXPECT_EQ(dump(stored("")), "");
    EXPECT_EQ(dump(stored(packed(""))), "");
    EXPECT_TRUE(log.take().empty());
    EXPECT_EQ(dump(stored("no compressed data")), "");

    std::mt19937 random(1);
    std::string noise;
    while (noise.size() < 300000)
        noise.push_back("0123456789abcdef"[random() % 16]);
    const std::string blob = packed(kHead + noise);
    for (const std::size_t length : {std::size_t{1}, blob.size() / 3, blob.size() - 5}) {
        const std::string text = auxText(blob.substr(0, length));
        if (length > 1) {
            EXPECT_GT(text.size(), length / 2);
            EXPECT_EQ(noise.substr(0, text.size()), text);
        } else {
            EXPECT_EQ(text, "none");
        }
    }
    EXPECT_FALSE(log.take().empty());
}

} // namespace
} // namespace tavi
