#include <cstring>
#include <string>

#include <gtest/gtest.h>

volatile std::size_t tooMuch = 64;

[[gnu::noinline]] static void writeBeyondTheArray()
{
    char bytes[16];
    volatile char* const at = bytes;
    for (std::size_t i = 0; i < tooMuch; ++i)
        at[i] = 'x';
}

TEST(StackProtectorDeathTest, AnOverrunEndsTheProcessAtOnce)
{
    const testing::ExitedWithCode overrun(static_cast<int>(0xC0000409));
    EXPECT_EXIT(writeBeyondTheArray(), overrun, "");
    static char bytes[16]; // beyond the reach of the stack protector
    EXPECT_EXIT(std::memcpy(bytes, std::string(tooMuch, 'x').c_str(), tooMuch), overrun, "");
}
