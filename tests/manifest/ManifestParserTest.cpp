#include "manifest/ManifestParser.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

#define REST "123456789abcdef0123456789abcdef01234567"
#define DIGEST "0" REST

TEST(ManifestParser, ReadsEveryFormOfTextInSlicesOfAnyLength)
{
    const std::tuple<const char*, std::string, const char*> cases[] = {
        {"two hash lines", "USER\nline\n_hash|abc\n_hash|def\n", "abc[line\n_hash|def\n] "},
        {"no hash line", "USER\nx _hash|abc", "da39a3ee5e6b4b0d3255bfef95601890afd80709[x _hash|abc] "},
        {"user sections, two empty", "USER\n_hash|abc\nold\n\n\nUSER\nnew\n\n\nUSER\n\n\nUSER", "abc[new] "},
        {"both sections", "USER\n_hash|h\nu\n\n\nFILES\na\n1:2", "h[u] a = 0:1:0:2:0::0:0 "},
        {"one empty line", "USER\n_hash|h\nu\n\nFILES\na\n1:2", "h[u\n\nFILES\na\n1:2] "},
        {"separator first, empty section", "\n\n\nFILES\na\n1:2\n\n\n\n\n\nFILES\nb\n3:4",
         "a = 0:1:0:2:0::0:0 b = 0:3:0:4:0::0:0 "},
        {"unknown sections", "files\nab\n\nFILES\nc\n1:2\n\n\nFILES\na\n1:2\n\n\nb\n3:4", "a = 0:1:0:2:0::0:0 "},
        {"path given twice, path without versions", "FILES\na\n1:2\n\nb\n1\n\na\n3:4\n5:6\n\nb\n\nc\n\n",
         "a = 0:3:0:4:0::0:0 0:5:0:6:0::0:0 b = 0:1:0:0:0::0:0 "},
        {"newline at the end, a version of zeros", "FILES\na\n1:2\n", "a = 0:1:0:2:0::0:0 0:0:0:0:0::0:0 "},
        {"one to eight fields", "FILES\na\n1\n1:2:3\n1:2:3:t\n1:2:3:4:5\n1:2:3:4:t:5\n1:2:3:4:t:5:6\n1:2:3:4:5:t:6:17",
         "a = 0:1:0:0:0::0:0 0:1:0:2:3::0:0 0:1:0:2:3:t:0:0 0:1:0:2:3:4:5:0 1:2:0:3:4:t:5:0 1:2:0:3:4:t:6:0 "
         "1:2:3:4:5:t:6:17 "},
        {"digest beside another value, too long, in upper case",
         "FILES\na\n1:2:3:4:7:" DIGEST ":0:40\n1:2:3:4:0:" DIGEST "8:0:40\n1:2:3:4:0:A" REST ":0:40",
         "a = 1:2:3:4:7:" DIGEST ":0:40 1:2:3:4:0:" DIGEST "8:0:40 1:2:3:4:0:A" REST ":0:40 "},
        {"odd numbers", "FILES\na\n \t12x:+3 4:--5:- 6:x:t:-7:8\n1:2:3:4:0:" DIGEST ":0:778",
         "a = 12:3:0:0:0:t:-7:0 1:2:3:4:0:" DIGEST ":0:77 "},
        {"limits", "FILES\na\n4294967295:-1:4294967297:9223372036854775807:-9223372036854775808::-1:+37777777777",
         "a = 4294967295:4294967295:1:9223372036854775807:-9223372036854775808::-1:37777777777 "},
        {"long numbers beside a digest", "FILES\na\n1\n12345678901:2:3:4294967296:0:" DIGEST ":0:0\n1",
         "a = 0:1:0:0:0::0:0 3755744309:2:3:4294967296:0:" DIGEST ":0:0 0:1:0:0:0::0:0 "},
        {"characters of every length", "FILES\n\xC3\xA4\\\xE6\x97\xA5\xED\xA0\xBD\xED\xB8\x80\n1:2:0:\xC3\xB6",
         "\xC3\xA4\\\xE6\x97\xA5\xF0\x9F\x98\x80 = 0:1:0:2:0:\xC3\xB6:0:0 "},
        {"invalid lines", "USER\nu\n\n\nFILES\na\n1:2\n\nb\n:::::%s:::\n:::::::::\n\nc\n1:2",
         "none1: Error: Invalid patch in manifest: :::::%s:::1: Error: Attempting to parse invalid manifest"},
    };
    test::LogCapture log;
    for (const auto& [label, text, expected] : cases) {
        for (std::size_t length = 1; length <= text.size(); ++length) {
            ManifestParser parser;
            for (std::size_t at = 0; at < text.size(); at += length)
                parser.feed(text.substr(at, length).c_str(), std::min(length, text.size() - at));
            const std::string read = test::dump(parser.finish(countUtf16Units(text)));
            ASSERT_EQ(read + log.takeText(), expected) << label << ", slices of " << length;
        }
    }
}

} // namespace
} // namespace tavi
