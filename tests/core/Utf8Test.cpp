#include "core/Utf8.h"

#include <gtest/gtest.h>

using namespace tavi;

TEST(Utf8, ConvertsAndMeasuresTexts)
{
    // With the first character of three bytes, the last of all, and a lone surrogate.
    const std::wstring wide = L"a\u00E9\u0800\u20AC\U0001F600\U0010FFFF" + std::wstring(1, wchar_t{0xD800});
    const std::string bytes = "a\xC3\xA9\xE0\xA0\x80\xE2\x82\xAC\xF0\x9F\x98\x80\xF4\x8F\xBF\xBF\xED\xA0\x80";
    EXPECT_EQ(toUtf8(wide), bytes);
    EXPECT_EQ(fromUtf8(bytes), wide);
    EXPECT_EQ(countUtf16Units(bytes), 9u);
    EXPECT_EQ(utf8PrefixLength(bytes, 4), 9u);
    EXPECT_EQ(utf8PrefixLength(bytes, 100), bytes.size());
}

TEST(Utf8, ReplacesEachByteOfWhatIsNoCharacter)
{
    // A continuation alone, a character interrupted and one cut, one of more bytes than it needs, one beyond Unicode.
    for (const std::string bytes : {"\x80", "\xE2\x82", "\xF0\x9F\x98", "\xE0\x9F\xBF", "\xF4\x90\x80\x80", "\xFF"})
        EXPECT_EQ(fromUtf8(bytes + "z"), std::wstring(bytes.size(), L'\uFFFD') + L"z");
    EXPECT_EQ(fromUtf8("\xF0\x9F\x98"), L"\uFFFD\uFFFD\uFFFD");
}
