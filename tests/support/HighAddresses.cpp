// Makes what a 64-bit test program allocates from the C heap or the kernel lie above 4 GB: a pointer that code cuts to
// 32 bits must not pass by chance, and Wine places heaps below 4 GB while there is room.
#ifdef _WIN64
#include <cstdint>
#include <cstdlib>

#include <windows.h>

[[gnu::constructor]] static void takeLowAddresses()
{
    const auto isLow = [](const void* pointer) { return reinterpret_cast<std::uintptr_t>(pointer) >> 32 == 0; };
    // Address space is reserved in units of 64 KB.
    for (std::size_t size = std::size_t{1} << 31; size >= 0x10000; size /= 2) {
        while (isLow(VirtualAlloc(nullptr, size, MEM_RESERVE, PAGE_NOACCESS))) {
        }
    }
    // What the heap had reserved before is used up, and never freed.
    for (std::size_t size = 1 << 20; size >= 1; size = size > 1024 ? size / 2 : size - 1) {
        while (isLow(std::malloc(size))) {
        }
    }
}
#endif
