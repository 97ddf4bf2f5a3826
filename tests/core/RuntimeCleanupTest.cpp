#include "core/RuntimeCleanup.h"

#include <exception>

#include <gtest/gtest.h>

TEST(RuntimeCleanup, KeepsWhatAnExceptionInFlightNeeds)
{
    try {
        throw 1;
    } catch (...) {
        tavi::releaseThreadRuntime();
        EXPECT_TRUE(std::current_exception());
    }
}
