#include "core/RuntimeCleanup.h"

#include <stdexcept>

#include <gtest/gtest.h>

namespace tavi {
namespace {

TEST(RuntimeCleanup, KeepsWhatAnExceptionInFlightNeeds)
{
    try {
        throw std::runtime_error("kept");
    } catch (const std::runtime_error&) {
        releaseThreadRuntime();
        EXPECT_TRUE(std::current_exception());
    }
}

} // namespace
} // namespace tavi
