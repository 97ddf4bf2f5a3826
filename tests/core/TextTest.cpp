#include "core/Text.h"

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(Text, RoundTripsWhatWindowsAllowsInNamesAndReplacesMalformedBytes)
{
    const std::pair<std::wstring, std::string> names[] = {
        {L"a\x7F\x80\x7FF", "a\x7F\xC2\x80\xDF\xBF"},
        {L"\x800\xFFFD", "\xE0\xA0\x80\xEF\xBF\xBD"},
        {L"\U0001F600x", "\xF0\x9F\x98\x80x"},
        {{wchar_t(0xDE00), L'!', wchar_t(0xD83D)}, "\xED\xB8\x80!\xED\xA0\xBD"},
        {std::wstring(L"a\0b", 3), std::string("a\0b", 3)},
    };
    for (const auto& [wide, utf8] : names) {
        EXPECT_EQ(toUtf8(wide), utf8);
        EXPECT_EQ(fromUtf8(utf8).ToStdWstring(), wide);
    }
    EXPECT_EQ(fromUtf8("\x80z \xC1\x81 \xE2\x82 \xF4\x90\x80\x80 \xC3("),
              L"\xFFFDz \xFFFD\xFFFD \xFFFD\xFFFD \xFFFD\xFFFD\xFFFD\xFFFD \xFFFD(");
}

} // namespace
} // namespace tavi
