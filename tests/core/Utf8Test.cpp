#include "core/Utf8.h"

#include <gtest/gtest.h>

using namespace tavi;
using Form = Utf8Sequence::Form;

TEST(Utf8, DecodesTheFirstSequence)
{
    const std::tuple<const char*, std::string_view, Form, std::size_t, char32_t> cases[] = {
        {"ASCII", "a\xFF", Form::whole, 1, U'a'},
        {"first of three bytes", "\xE0\xA0\x80z", Form::whole, 3, 0x800},
        {"last of all", "\xF4\x8F\xBF\xBFz", Form::whole, 4, 0x10FFFF},
        {"lone surrogate", "\xED\xA0\x80", Form::whole, 3, 0xD800},
        {"last byte missing", "\xF0\x9F\x98", Form::truncated, 3, 0xFFFD},
        {"continuation alone", "\x80", Form::malformed, 1, 0xFFFD},
        {"interrupted", "\xE2\x82z", Form::malformed, 1, 0xFFFD},
        {"overlong of three bytes", "\xE0\x9F\xBF", Form::malformed, 1, 0xFFFD},
        {"beyond Unicode", "\xF4\x90\x80\x80", Form::malformed, 1, 0xFFFD},
    };
    for (const auto& [what, text, form, length, point] : cases) {
        const Utf8Sequence found = decodeUtf8(text);
        EXPECT_EQ(found.form, form) << what;
        EXPECT_EQ(found.length, length) << what;
        EXPECT_TRUE(found.point == point) << what;
    }
}

TEST(Utf8, ConvertsAndMeasuresTexts)
{
    const std::wstring wide = L"a\u00E9\u20AC\U0001F600" + std::wstring(1, wchar_t{0xD800});
    const std::string bytes = "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\xED\xA0\x80";
    EXPECT_EQ(toUtf8(wide), bytes);
    EXPECT_EQ(fromUtf8(bytes), wide);
    EXPECT_EQ(fromUtf8("a\xFF\xC3"), L"a\uFFFD\uFFFD");
    EXPECT_EQ(countUtf16Units(bytes), 6u);
    EXPECT_EQ(utf8PrefixLength(bytes, 3), 6u);
    EXPECT_EQ(utf8PrefixLength(bytes, 100), bytes.size());
}
