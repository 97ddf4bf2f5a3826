// The runtime of the stack protector and of the fortified library calls. GCC's own runtime asks a crypto provider for the
// guard, which loads libraries under the loader lock, and reports a failure to a console.
#include <stdint.h>
#include <windows.h>

uintptr_t __stack_chk_guard = (uintptr_t)0xBB40E64E;

// Runs before every other constructor, when no active frame of the module holds the initial value.
__attribute__((constructor(101), no_stack_protector)) static void seedGuard(void)
{
    LARGE_INTEGER counter;
    FILETIME now;
    QueryPerformanceCounter(&counter);
    GetSystemTimeAsFileTime(&now);
    uint64_t mixed = (uint64_t)counter.QuadPart * 0x9E3779B97F4A7C15u;
    mixed ^= ((uint64_t)now.dwHighDateTime << 32 | now.dwLowDateTime) * 0xBF58476D1CE4E5B9u;
    mixed ^= ((uint64_t)GetCurrentProcessId() << 32 | GetCurrentThreadId()) * 0x94D049BB133111EBu;
    mixed ^= (uint64_t)(uintptr_t)&counter * (uintptr_t)&__stack_chk_guard;
    mixed = (mixed ^ mixed >> 29) * 0xBF58476D1CE4E5B9u;
    __stack_chk_guard = (uintptr_t)(mixed >> 32 ^ mixed);
}

// Ends the host without running a handler, since its stack or heap is corrupt.
__attribute__((noreturn)) void __chk_fail(void)
{
    if (IsProcessorFeaturePresent(23 /* PF_FASTFAIL_AVAILABLE */))
        __asm__ volatile("int $0x29" ::"c"(2 /* FAST_FAIL_STACK_COOKIE_CHECK_FAILURE */));
    TerminateProcess(GetCurrentProcess(), 0xC0000409 /* STATUS_STACK_BUFFER_OVERRUN */);
    __builtin_unreachable();
}

__attribute__((noreturn)) void __stack_chk_fail(void)
{
    __chk_fail();
}
