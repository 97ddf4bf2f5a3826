#include "manifest/StoredManifest.h"

#include <random>

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;
using namespace std::string_literals;

const std::string kHead = "FILES\nfile\n1:2:0:";

// The text behind kHead is an aux text, which shows where the whole text ends.
std::string auxText(const std::string& blob)
{
    const ManifestRef manifest = stored(blob);
    const auto patches = manifest ? manifest->findPatches(L"file") : std::nullopt;
    return patches ? utf8((*patches)[0].auxText()) : "none";
}

TEST(StoredManifest, EndsAtTheFirstZeroOrMalformedSequence)
{
    // The first and the last of each length, and of the surrogates.
    const std::string valid =
        "a\xC2\x80\xDF\xBF\xE0\xA0\x80\xED\x9F\xBF\xED\xA0\x80\xEF\xBF\xBF\xF0\x90\x80\x80\xF4\x8F\xBF\xBF";
    const std::string later = std::string(100000, 'x') + "\xC3\xA4\n1:2:3:4:5:6:7:8:9";
    const std::string faults[] = {"\xC1\xBF", "\xE0\x9F\xBF",         "\xF0\x8F\xBF\xBF", "\xF4\x90\x80\x80", "\x80",
                                  "\xFF",     "\xFB\xBF\xBF\xBF\xBF", "\xE6\x97z",        "\xC3\xC3\xA4",     "\0b\0"s,
                                  "\0\xFF"s,  "\0"s + later};
    for (const std::string& fault : faults) {
        // Also behind the first read, at every offset in a machine word.
        for (const std::size_t length : {0u, 100000u, 100001u, 100002u, 100003u}) {
            const std::string before = std::string(length, 'x') + valid;
            EXPECT_EQ(auxText(packed(kHead + before + fault + "z")), before) << fault;
            EXPECT_EQ(auxText(packed(kHead + before + "z")), before + "z") << "left behind by " << fault;
        }
    }
}

TEST(StoredManifest, KeepsACharacterThatAReadOrTheEndOfATextCutsInTwo)
{
    for (const std::string whole : {"\xC3\xA4", "\xE6\x97\xA5", "\xF0\x9F\x98\x80"}) {
        for (std::size_t behind = 1; behind <= whole.size(); ++behind) {
            const std::string text = std::string(64 * 1024 - kHead.size() - behind, 'x') + whole + "end";
            EXPECT_EQ(auxText(packed(kHead + text)), text);
        }
        for (std::size_t cut = 1; cut < whole.size(); ++cut) {
            EXPECT_EQ(auxText(packed(kHead + "a" + whole.substr(0, cut))), "a");
            EXPECT_EQ(dump(Manifest::parse("FILES\nb\n1")), "b = 0:1:0:0:0::0:0 ") << "not stored, so not affected";
            const ManifestRef next = stored(packed(whole.substr(cut) + "x\n\n\n" + kHead + "b"));
            EXPECT_EQ(next->fileCount(), 1u);
            EXPECT_EQ(next->textLength(), (whole.size() == 4 ? 2u : 1u) + 4 + kHead.size() + 1 + 1);

            // Also behind a zero. A text that does not continue the character ends at once.
            EXPECT_EQ(auxText(packed(kHead + "a\0"s + whole.substr(0, cut))), "a");
            EXPECT_EQ(stored(packed(kHead + "b"))->textLength(), 1u);
            EXPECT_EQ(auxText(packed(kHead + "b")), "b");
        }
    }
}

TEST(StoredManifest, TakesGzipAndEmptyTextsInSilence)
{
    LogCapture log;
    EXPECT_EQ(auxText(packed(kHead + "gzip", wxZLIB_GZIP)), "gzip");
    EXPECT_EQ(dump(stored("")) + dump(stored(packed(""))), "");
    EXPECT_TRUE(log.take().empty());
}

TEST(StoredManifest, HoldsWhatABrokenBlobInflatesTo)
{
    LogCapture log;
    EXPECT_EQ(dump(stored("no compressed data")) + dump(stored(packed(kHead).substr(0, 1))), "");
    std::mt19937 random(1);
    std::string noise;
    while (noise.size() < 300000)
        noise += std::to_string(random());
    const std::string blob = packed(kHead + noise);
    for (const std::size_t length : {blob.size() / 3, blob.size() - 5}) {
        const std::string text = auxText(blob.substr(0, length));
        EXPECT_GT(text.size(), length / 2);
        EXPECT_EQ(noise.substr(0, text.size()), text);
    }
    EXPECT_FALSE(log.take().empty());
}

} // namespace
} // namespace tavi
