#include <cstring>

#include <gtest/gtest.h>

namespace tavi {
namespace {

volatile std::size_t tooMuch = 64;

[[gnu::noinline]] void writeBeyondTheArray()
{
    char bytes[16];
    volatile char* const at = bytes;
    for (std::size_t i = 0; i < tooMuch; ++i)
        at[i] = 'x';
}

[[gnu::noinline]] void copyBeyondTheArray()
{
    static char bytes[16]; // beyond the reach of the stack protector
    std::memcpy(bytes, "0123456789012345678901234567890123456789012345678901234567890123", tooMuch);
    asm volatile("" ::"r"(bytes) : "memory");
}

TEST(HardeningDeathTest, AnOverrunEndsTheHostAtOnce)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const testing::ExitedWithCode overrun(static_cast<int>(0xC0000409));
    EXPECT_EXIT(writeBeyondTheArray(), overrun, "");
    EXPECT_EXIT(copyBeyondTheArray(), overrun, "");
}

} // namespace
} // namespace tavi
