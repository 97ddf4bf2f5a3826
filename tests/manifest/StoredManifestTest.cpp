#include <gtest/gtest.h>

#include <random>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;
using namespace std::string_literals;

TEST(ManifestParser, TakesTheTextApart)
{
    // '#' stands for a digest.
    const struct {
        std::string text, expected, invalidLine = {};
    } cases[] = {
        // User section and hash.
        {"USER\n_hash|abc\nline", "abc[line] "},
        {"USER\nline\n_hash|abc\n_hash|def\n", "abc[line\n_hash|def\n] "},
        {"USER\nx _hash|abc", "da39a3ee5e6b4b0d3255bfef95601890afd80709[x _hash|abc] "},
        {"USER\n_hash|abc\nold\n\n\nUSER\nnew\n\n", "abc[new\n\n] "},
        {"USER\n_hash|abc\nold\n\n\nUSER\n\n\nUSER", "abc[old] "},
        // Sections.
        {"USER\n_hash|h\nu\n\n\nFILES\na\n1:2", "h[u] a = 0:1:0:2:0::0:0 "},
        {"USER\n_hash|h\nu\n\nFILES\na\n1:2", "h[u\n\nFILES\na\n1:2] "},
        {"\n\n\nFILES\na\n1:2", "a = 0:1:0:2:0::0:0 "},
        {"FILES\na\n1:2\n\n\n\n\n\nFILES\nb\n3:4", "a = 0:1:0:2:0::0:0 b = 0:3:0:4:0::0:0 "},
        {"files\nab\n\nFILES\na\n1:2", ""},
        {"FILES\na\n1:2\n\n\nb\n3:4", "a = 0:1:0:2:0::0:0 "},
        // Entries: the last of a path counts.
        {"FILES\na\n1:2\n\nb\n1\n\na\n3:4\n5:6\n\nb\n\nc\n\n", "a = 0:3:0:4:0::0:0 0:5:0:6:0::0:0 b = 0:1:0:0:0::0:0 "},
        // The empty line behind a lone last newline is a version of zeros; nobody may repair that.
        {"FILES\na\n1:2\n", "a = 0:1:0:2:0::0:0 0:0:0:0:0::0:0 "},
        // Layouts.
        {"FILES\na\n1:2:3:4:t:5\n1:2:3:4:t:5:6\n1:2:3:4:5:t:6:17",
         "a = 1:2:0:3:4:t:5:0 1:2:0:3:4:t:6:0 1:2:3:4:5:t:6:17 "},
        {"FILES\na\n1\n1:2:3\n1:2:3:t\n1:2:3:4:5",
         "a = 0:1:0:0:0::0:0 0:1:0:2:3::0:0 0:1:0:2:3:t:0:0 0:1:0:2:3:4:5:0 "},
        {"USER\nu\n\n\nFILES\na\n1:2\n\nb\n:::::%s:::\n:::::::::\n\nc\n1:2", "none", ":::::%s:::"},
        // A digest is kept apart from other aux texts.
        {"FILES\na\n1:2:3:4:0:#:0:40\n1:2:3:-1:0:#:0:0", "a = 1:2:3:4:0:#:0:40 1:2:3:-1:0:#:0:0 "},
        {"FILES\na\n1:2:3:4:7:#:0:40\n1:2:3:4:0:#8:0:40\n1:2:3:4:0:0123456789ABCDEF0123456789abcdef01234567:0:40",
         "a = 1:2:3:4:7:#:0:40 1:2:3:4:0:#8:0:40 1:2:3:4:0:0123456789ABCDEF0123456789abcdef01234567:0:40 "},
        // Numbers.
        {"FILES\na\n \t12x:+3 4:--5:- 6:x:t:-7:8\n1:2:3:4:0:#:0:778", "a = 12:3:0:0:0:t:-7:0 1:2:3:4:0:#:0:77 "},
        {"FILES\na\n4294967295:-1:4294967297:9223372036854775807:-9223372036854775808::-1:+37777777777",
         "a = 4294967295:4294967295:1:9223372036854775807:-9223372036854775808::-1:37777777777 "},
        {"FILES\na\n1\n12345678901:2:3:4294967296:0:#:0:0\n1",
         "a = 0:1:0:0:0::0:0 3755744309:2:3:4294967296:0:#:0:0 0:1:0:0:0::0:0 "},
        // Characters of every length, and one in two halves.
        {"FILES\n\xC3\xA4\\\xE6\x97\xA5\xF0\x9F\x98\x80\n1:2:0:\xC3\xB6",
         "\xC3\xA4\\\xE6\x97\xA5\xF0\x9F\x98\x80 = 0:1:0:2:0:\xC3\xB6:0:0 "},
        {"FILES\n\xED\xA0\xBD\xED\xB8\x80\n1\n\n\xF0\x9F\x98\x80\n3\n\n\xED\xB8\x80\n5\n\n\xED\xA0\xBD\n7",
         "\xED\xA0\xBD = 0:7:0:0:0::0:0 \xED\xB8\x80 = 0:5:0:0:0::0:0 \xF0\x9F\x98\x80 = 0:3:0:0:0::0:0 "},
    };
    // Cut at every place, and whole.
    for (auto [text, expected, invalidLine] : cases) {
        for (std::string* string : {&text, &expected})
            for (std::size_t at; (at = string->find('#')) != std::string::npos;)
                string->replace(at, 1, "0123456789abcdef0123456789abcdef01234567");
        SCOPED_TRACE("text: " + text);
        LogCapture log;
        std::vector<std::string> logged;
        if (!invalidLine.empty())
            logged = {"1: Error: Invalid patch in manifest: " + invalidLine,
                      "1: Error: Attempting to parse invalid manifest"};
        for (std::size_t slice = 1; slice <= text.size(); ++slice) {
            ManifestParser parser;
            for (std::size_t at = 0; at < text.size(); at += slice) {
                const std::string part = text.substr(at, slice);
                parser.feed(part.c_str(), part.size());
            }
            ASSERT_EQ(dump(parser.finish(countUtf16Units(text))), expected) << "in slices of " << slice;
            ASSERT_EQ(log.take(), logged);
        }
    }
}

const std::string kHead = "FILES\nfile\n1:2:0:";

// Texts whose last field is the aux text, so that it shows where they end.
std::string auxText(const std::string& blob)
{
    const ManifestRef manifest = stored(blob);
    const auto patches = manifest ? manifest->findPatches(L"file") : std::nullopt;
    return patches ? utf8((*patches)[0].auxText()) : "none";
}

TEST(StoredManifest, TheTextEndsAtTheFirstFault)
{
    // The first and the last of each length, and of the halves of characters.
    const std::string valid =
        "a\xC2\x80\xDF\xBF\xE0\xA0\x80\xED\x9F\xBF\xED\xA0\x80\xEF\xBF\xBF\xF0\x90\x80\x80\xF4\x8F\xBF\xBF";
    const std::string later = std::string(100000, 'x') + "\xC3\xA4\n1:2:3:4:5:6:7:8:9";
    const std::string faults[] = {"\xC1\xBF", "\xE0\x9F\xBF",         "\xF0\x8F\xBF\xBF", "\xF4\x90\x80\x80", "\x80",
                                  "\xFF",     "\xFB\xBF\xBF\xBF\xBF", "\xE6\x97z",        "\xC3\xC3\xA4",     "\0b\0"s,
                                  "\0\xFF"s,  "\0"s + later};
    for (const std::string& fault : faults) {
        // Also far behind the first write, at every place of the machine's word.
        for (const std::size_t length : {0u, 100000u, 100001u, 100002u, 100003u}) {
            const std::string before = std::string(length, 'x') + valid;
            EXPECT_EQ(auxText(packed(kHead + before + fault + "z")), before) << fault;
            EXPECT_EQ(auxText(packed(kHead + before + "z")), before + "z") << "left behind by " << fault;
        }
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
            EXPECT_EQ(dump(Manifest::parse("FILES\nb\n1")), "b = 0:1:0:0:0::0:0 ");
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

TEST(StoredManifest, HeadersAndBrokenBlobs)
{
    LogCapture log;
    EXPECT_EQ(auxText(packed(kHead + "gzip", wxZLIB_GZIP)), "gzip");
    EXPECT_EQ(dump(stored("")) + dump(stored(packed(""))), "");
    EXPECT_TRUE(log.take().empty());
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
