#include <gtest/gtest.h>

#include "tests/backupset/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;

// Every way in, and every place at which the bytes may be cut.
void expectDump(const std::string& text, const std::string& expected)
{
    SCOPED_TRACE("text: " + text);
    LogCapture log;
    EXPECT_EQ(dump(held(Manifest::Parse(fromUtf8(text)))), expected);
    const auto logged = log.take();
    EXPECT_EQ(logged.size(), expected == "none" ? 2u : 0u);
    EXPECT_EQ(dump(stored(packed(text))), expected);
    EXPECT_EQ(log.take(), logged);
    for (std::size_t slice = 1; slice < text.size(); ++slice) {
        ManifestParser parser;
        for (std::size_t at = 0; at < text.size(); at += slice) {
            const std::string part = text.substr(at, slice);
            parser.feed(part.data(), part.size());
        }
        ASSERT_EQ(dump(held(parser.finish(countUtf16Units(text)))), expected) << "in slices of " << slice;
    }
}

const std::string kDigest = "0123456789abcdef0123456789abcdef01234567";

TEST(ManifestParser, TakesTheTextApart)
{
    const struct {
        std::string text, expected;
    } cases[] = {
        {"", ""},
        {"FILES\n", ""},
        {"FILES", ""},
        {"USER", ""},
        {"OTHER\na\n1:2", ""},
        {"files\na\n1:2", ""},
        // User section and hash.
        {"USER\n_hash|abc\nline", "abc[line] "},
        {"USER\nline\n_hash|abc\n_hash|def\n", "abc[line\n_hash|def\n] "},
        {"USER\n_hash|", "[] "},
        {"USER\n_hash|abc\n123456789\n_hash|def", "abc[123456789\n_hash|def] "},
        {"USER\nx _hash|abc", "da39a3ee5e6b4b0d3255bfef95601890afd80709[x _hash|abc] "},
        {"USER\n_hash|abc\nold\n\n\nUSER\nnew\n\n", "abc[new\n\n] "},
        {"USER\n_hash|abc\nold\n\n\nUSER\n", "abc[] "},
        {"USER\n_hash|abc\nold\n\n\nUSER\n\n\nUSER", "abc[old] "},
        // Sections.
        {"USER\nu\n\n\nFILES\na\n1:2", "da39a3ee5e6b4b0d3255bfef95601890afd80709[u] a = 0:1:0:2:0::0:0 "},
        {"USER\nu\n\nFILES\na\n1:2", "da39a3ee5e6b4b0d3255bfef95601890afd80709[u\n\nFILES\na\n1:2] "},
        {"\n\n\nFILES\na\n1:2", "a = 0:1:0:2:0::0:0 "},
        {"\n\n\n\nFILES\na\n1:2", ""},
        {"FILES\na\n1:2\n\n\n\n\n\nFILES\nb\n3:4", "a = 0:1:0:2:0::0:0 b = 0:3:0:4:0::0:0 "},
        {"OTHER\nab\n\nFILES\na\n1:2", ""},
        {"FILES\na\n1:2\n\n\nb\n3:4", "a = 0:1:0:2:0::0:0 "},
        {"FILES\n\n\na\n1:2", ""},
        {"FILES\n\na\n1:2", "a = 0:1:0:2:0::0:0 "},
        // Entries.
        {"FILES\na\n\nb\n1:2\n\n", "b = 0:1:0:2:0::0:0 "},
        {"FILES\na\n1:2\n\na\n3:4\n5:6", "a = 0:3:0:4:0::0:0 0:5:0:6:0::0:0 "},
        {"FILES\na\n1:2\n\n\nFILES\na\n3:4", "a = 0:3:0:4:0::0:0 "},
        {"FILES\na\n1:2\n\na\n\n", "a = 0:1:0:2:0::0:0 "},
        {"FILES\nx\\b\n1:2\n\nx\\a\n3:4\n\nx\n5:6\n\nX\\a\n7:8",
         "x = 0:5:0:6:0::0:0 X\\a = 0:7:0:8:0::0:0 x\\a = 0:3:0:4:0::0:0 x\\b = 0:1:0:2:0::0:0 "},
        // The empty line behind a lone last newline is a version of zeros; nobody may repair that.
        {"FILES\na\n1:2\n", "a = 0:1:0:2:0::0:0 0:0:0:0:0::0:0 "},
        {"FILES\na\n", "a = 0:0:0:0:0::0:0 "},
        {"FILES\na\n1:2\n\n", "a = 0:1:0:2:0::0:0 "},
        // Layouts.
        {"FILES\na\n1:2:3:4:5:t:6:17", "a = 1:2:3:4:5:t:6:17 "},
        {"FILES\na\n1:2:3:4:t:5", "a = 1:2:0:3:4:t:5:0 "},
        {"FILES\na\n1:2:3:4:t:5:6", "a = 1:2:0:3:4:t:6:0 "},
        {"FILES\na\n5:1024:0:abc:0", "a = 0:5:0:1024:0:abc:0:0 "},
        {"FILES\na\n1\n1:2:3\n1:2:3:t\n:::::::", "a = 0:1:0:0:0::0:0 0:1:0:2:3::0:0 0:1:0:2:3:t:0:0 0:0:0:0:0::0:0 "},
        {"FILES\na\n1:2:3:4:5:t:6:17:", "none"},
        {"USER\nu\n\n\nFILES\na\n1:2\n\nb\n:::::::::\n\nc\n1:2", "none"},
        // A digest is kept apart from other aux texts.
        {"FILES\na\n1:2:3:4:0:" + kDigest + ":0:40\n1:2:3:-1:0:" + kDigest + ":0:0",
         "a = 1:2:3:4:0:" + kDigest + ":0:40 1:2:3:-1:0:" + kDigest + ":0:0 "},
        {"FILES\na\n1:2:3:4:7:" + kDigest + ":0:40\n1:2:3:4:0:" + kDigest +
             "8:0:40\n1:2:3:4:0:0123456789ABCDEF0123456789abcdef01234567:0:40",
         "a = 1:2:3:4:7:" + kDigest + ":0:40 1:2:3:4:0:" + kDigest +
             "8:0:40 1:2:3:4:0:0123456789ABCDEF0123456789abcdef01234567:0:40 "},
        // Numbers.
        {"FILES\na\n \t12x:+3 4:--5:- 6:x:t:-7:8", "a = 12:3:0:0:0:t:-7:0 "},
        {"FILES\na\n1\n1:2:3:4:0:" + kDigest +
             ":0:778\n4294967295:-1:4294967297:9223372036854775807:-9223372036854775808::-1:+37777777777",
         "a = 0:1:0:0:0::0:0 1:2:3:4:0:" + kDigest +
             ":0:77 4294967295:4294967295:1:9223372036854775807:-9223372036854775808::-1:37777777777 "},
        {"FILES\na\n1\n12345678901:2:3:4294967296:0:" + kDigest + ":0:0\n1",
         "a = 0:1:0:0:0::0:0 3755744309:2:3:4294967296:0:" + kDigest + ":0:0 0:1:0:0:0::0:0 "},
        // Characters of every length, and one in two halves.
        {"FILES\n\xC3\xA4\\\xE6\x97\xA5\xF0\x9F\x98\x80\n1:2:0:\xC3\xB6",
         "\xC3\xA4\\\xE6\x97\xA5\xF0\x9F\x98\x80 = 0:1:0:2:0:\xC3\xB6:0:0 "},
        {"FILES\n\xED\xA0\xBD\xED\xB8\x80\n1:2\n\n\xF0\x9F\x98\x80\n3:4", "\xF0\x9F\x98\x80 = 0:3:0:4:0::0:0 "},
        {"FILES\n\xED\xA0\xBD\n1:2\n\n\xED\xB8\x80\n3:4",
         "\xED\xA0\xBD = 0:1:0:2:0::0:0 \xED\xB8\x80 = 0:3:0:4:0::0:0 "},
    };
    for (const auto& test : cases)
        expectDump(test.text, test.expected);
}

TEST(ManifestParser, LogsTheInvalidLineAndThenTheFailure)
{
    LogCapture log;
    EXPECT_FALSE(held(Manifest::Parse("FILES\na\n1:2\n1:2:3:4:5:%s:7:8:9\n1:2:3:4:5:6:7:8:9")));
    const std::vector<std::string> expected = {"1: Error: Invalid patch in manifest: 1:2:3:4:5:%s:7:8:9",
                                               "1: Error: Attempting to parse invalid manifest"};
    EXPECT_EQ(log.take(), expected);
}

TEST(ManifestParser, CountsTheTextInUtf16)
{
    const std::string text = "\n\xC3\xA4\xE6\x97\xA5\xF0\x9F\x98\x80\xED\xA0\xBD";
    EXPECT_EQ(held(Manifest::Parse(fromUtf8(text)))->textLength(), 1u + 1 + 1 + 2 + 1 + 1);
    EXPECT_EQ(stored(packed(text))->textLength(), 1u + 1 + 1 + 2 + 1 + 1);
    EXPECT_EQ(held(Manifest::Parse(wxString()))->textLength(), 1u);
}

} // namespace
} // namespace tavi
