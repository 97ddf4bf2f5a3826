#include "tests/support/Allocations.h"

using namespace tavi::test;

// The linker redirects the calls of the whole program here, also those of operator new and of the libraries.
// NOLINTBEGIN(readability-identifier-naming): the linker makes these names.
extern "C" {
void* __real_malloc(std::size_t size);
void* __wrap_malloc(std::size_t size)
{
    return FailingAllocations::fails(Heap::c, size) ? nullptr : __real_malloc(size);
}
void* __real_calloc(std::size_t count, std::size_t size);
void* __wrap_calloc(std::size_t count, std::size_t size)
{
    return FailingAllocations::fails(Heap::zeroed, count * size) ? nullptr : __real_calloc(count, size);
}
// An exception gets its memory. The C++ runtime has a reserve for it, but behind a lock that it allocates, too.
void* __real___cxa_allocate_exception(std::size_t size) noexcept;
void* __wrap___cxa_allocate_exception(std::size_t size) noexcept
{
    return FailingAllocations::exempt([=] { return __real___cxa_allocate_exception(size); });
}
}
// NOLINTEND(readability-identifier-naming)
