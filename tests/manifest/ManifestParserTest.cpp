#include "manifest/ManifestParser.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;

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

} // namespace
} // namespace tavi
