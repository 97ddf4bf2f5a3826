#include "core/ThreadLocals.h"

#include <thread>

#include <windows.h>
#include <malloc.h>
#include <gtest/gtest.h>

#include "core/RuntimeCleanup.h"
#include "tests/support/Allocations.h"

alignas(64) thread_local int counted = 7;

TEST(ThreadLocals, BelongToTheirThreadAndAreFreedWithIt)
{
    const auto busyBlocks = [] {
        int blocks = 0;
        PROCESS_HEAP_ENTRY entry{};
        while (HeapWalk(reinterpret_cast<HANDLE>(_get_heap_handle()), &entry))
            blocks += (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) != 0;
        return blocks;
    };
    int before = 0;
    for (int i = 0; i < 100; ++i) {
        std::thread([] {
            SetLastError(ERROR_BUSY);
            EXPECT_EQ(++counted, 8);
            EXPECT_EQ(GetLastError(), DWORD{ERROR_BUSY});
            EXPECT_EQ(reinterpret_cast<std::uintptr_t>(&counted) % 64, 0u);
        }).join();
        before = i == 0 ? busyBlocks() : before; // the runtime allocates some blocks once
    }
    EXPECT_LT(busyBlocks(), before + 50);
}

TEST(ThreadLocals, ExistInAThreadWithoutMemory)
{
    for (int i = 0; i < 20; ++i)
        std::thread([] {
            EXPECT_EQ((tavi::test::FailingAllocations(0, tavi::test::Heap::zeroed), ++counted), 8);
        }).join();
}

TEST(ThreadLocals, StayWhileAnExceptionIsInFlight)
{
    try {
        throw 1;
    } catch (...) {
        tavi::releaseThreadRuntime();
        EXPECT_TRUE(std::current_exception());
    }
}
