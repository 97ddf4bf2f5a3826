#include "core/ThreadLocals.h"

#include <thread>

#include <windows.h>
#include <malloc.h>
#include <gtest/gtest.h>

namespace tavi {
namespace {

alignas(64) thread_local int counted = 7;

std::size_t busyBlocks()
{
    std::size_t blocks = 0;
    PROCESS_HEAP_ENTRY entry{};
    while (HeapWalk(reinterpret_cast<HANDLE>(_get_heap_handle()), &entry))
        blocks += (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) != 0;
    return blocks;
}

TEST(ThreadLocals, BelongToTheirThreadAndAreFreedWithIt)
{
    const auto use = [] {
        SetLastError(ERROR_BUSY);
        EXPECT_EQ(++counted, 8);
        EXPECT_EQ(GetLastError(), DWORD{ERROR_BUSY});
        EXPECT_EQ(reinterpret_cast<std::uintptr_t>(&counted) % 64, 0u);
    };
    std::thread(use).join(); // the runtime allocates some blocks once
    const std::size_t before = busyBlocks();
    for (int i = 0; i < 100; ++i)
        std::thread(use).join();
    EXPECT_LT(busyBlocks(), before + 50);
}

} // namespace
} // namespace tavi
