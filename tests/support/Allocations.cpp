#include "tests/support/Allocations.h"

#include <cstdlib>
#include <new>

// The operators of the whole test program: every allocation may fail on demand.
void* operator new(std::size_t size)
{
    using namespace tavi::test;
    if (void* const block = FailingAllocations::fails(Heap::cpp) ? nullptr : std::malloc(size))
        return block;
    throw std::bad_alloc();
}
void operator delete(void* block) noexcept
{
    const void* freed = block;
    tavi::test::FailingAllocations::watched.compare_exchange_strong(freed, nullptr);
    std::free(block);
}
void operator delete(void* block, std::size_t) noexcept
{
    operator delete(block);
}
