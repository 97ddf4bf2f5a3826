// Makes what a 64-bit test program allocates from the C heap or the kernel lie above 4 GB: a pointer that code cuts to
// 32 bits must not pass by chance, and Wine places heaps below 4 GB while there is room.
#ifdef _WIN64
#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include <windows.h>

namespace {

constexpr std::uintptr_t kLimit = std::uintptr_t{1} << 32;

// Address space is reserved in units of this size, from multiples of it.
constexpr std::uintptr_t kUnit = 0x10000;

bool isLow(const void* pointer)
{
    return reinterpret_cast<std::uintptr_t>(pointer) < kLimit;
}

void reserveFreeSpace()
{
    MEMORY_BASIC_INFORMATION region{};
    for (std::uintptr_t at = kUnit;
         at < kLimit && VirtualQuery(reinterpret_cast<void*>(at), &region, sizeof(region)) != 0;) {
        const auto end = reinterpret_cast<std::uintptr_t>(region.BaseAddress) + region.RegionSize;
        const std::uintptr_t from = (at + kUnit - 1) / kUnit * kUnit;
        const std::uintptr_t to = end < kLimit ? end : kLimit;
        if (region.State == MEM_FREE && from < to)
            VirtualAlloc(reinterpret_cast<void*>(from), to - from, MEM_RESERVE, PAGE_NOACCESS);
        at = end;
    }
}

// What the heap had reserved before is used up, and never freed.
[[gnu::constructor]] void takeLowAddresses()
{
    reserveFreeSpace();
    for (std::size_t size = 1 << 20; size >= 1; size = size > 1024 ? size / 2 : size - 1) {
        int tries = 0;
        while (isLow(std::malloc(size))) {
            if (++tries == 1000000) {
                std::fputs("allocations stay below 4 GB\n", stderr);
                std::exit(1);
            }
        }
    }
}

} // namespace
#endif
