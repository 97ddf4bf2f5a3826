#include "core/ThreadLocals.h"

#include <algorithm>
#include <thread>

#include <malloc.h>
#include <windows.h>

#include <gtest/gtest.h>

namespace tavi {
namespace {

struct alignas(64) Wide {
    char bytes[100];
};
thread_local int counted = 7;
thread_local Wide wide;

std::size_t busyBlocks()
{
    std::size_t blocks = 0;
    PROCESS_HEAP_ENTRY entry{};
    while (HeapWalk(reinterpret_cast<HANDLE>(_get_heap_handle()), &entry))
        blocks += (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) != 0;
    return blocks;
}

TEST(ThreadLocals, BelongToTheirThreadAndGoWithIt)
{
    const auto use = [] {
        SetLastError(ERROR_BUSY);
        EXPECT_EQ(++counted, 8);
        EXPECT_EQ(GetLastError(), DWORD{ERROR_BUSY});
        EXPECT_EQ(reinterpret_cast<std::uintptr_t>(&wide) % alignof(Wide), 0u);
        EXPECT_EQ(std::count(std::begin(wide.bytes), std::end(wide.bytes), '\0'), 100);
        wide.bytes[50] = 'x';
    };
    std::thread(use).join(); // what the runtime allocates once
    const std::size_t before = busyBlocks();
    for (int i = 0; i < 100; ++i)
        std::thread(use).join();
    EXPECT_LT(busyBlocks(), before + 50);
}

} // namespace
} // namespace tavi
