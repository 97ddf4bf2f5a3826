#include "core/Text.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(Text, RoundTripsWhatWindowsAllowsInNames)
{
    struct Case {
        std::wstring wide;
        std::string utf8;
    };
    std::wstring smile = L"\U0001F600";
    const Case cases[] = {
        {L"", ""},
        {L"a\x7F\x80\x7FF", "a\x7F\xC2\x80\xDF\xBF"},
        {L"\x800\xFFFD", "\xE0\xA0\x80\xEF\xBF\xBD"},
        {smile + L"x", "\xF0\x9F\x98\x80x"},
        {std::wstring(1, wchar_t(0xD83D)) + L"!", "\xED\xA0\xBD!"},
        {std::wstring(1, wchar_t(0xDE00)), "\xED\xB8\x80"},
        {std::wstring(L"a\0b", 3), std::string("a\0b", 3)},
    };
    for (const Case& test : cases) {
        EXPECT_EQ(toUtf8(test.wide), test.utf8);
        EXPECT_EQ(fromUtf8(test.utf8).ToStdWstring(), test.wide);
    }
}

TEST(Text, ReplacesMalformedBytes)
{
    const struct {
        std::string utf8;
        std::wstring wide;
    } cases[] = {
        {"\x80z", L"\xFFFDz"},         {"\xC1\x81", L"\xFFFD\xFFFD"},
        {"\xE2\x82", L"\xFFFD\xFFFD"}, {"\xF4\x90\x80\x80", L"\xFFFD\xFFFD\xFFFD\xFFFD"},
        {"\xC3(", L"\xFFFD("},
    };
    for (const auto& test : cases)
        EXPECT_EQ(fromUtf8(test.utf8).ToStdWstring(), test.wide) << test.utf8;
}

} // namespace
} // namespace tavi
