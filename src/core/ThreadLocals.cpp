#include "core/ThreadLocals.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>

#include <windows.h>

#include "core/Boundary.h"
#include "core/Handles.h"
#include "core/InitializeOnce.h"

#if __GNUC__ != 12 && !defined(__clang__)
#error "Compare Variable and __emutls_get_address with libgcc's emutls.c of this compiler, then change the number."
#endif

namespace {

// The compiler's description of a variable, in the compiler's layout.
struct Variable {
    std::size_t size;
    std::size_t alignment;
    // 0 until the first use of the variable.
    std::atomic<std::uintptr_t> number;
    const void* initial;
};

// The C++ runtime has three small variables, a test program one more. A program with more than fit ends at the first
// use of the one too many.
constexpr std::uintptr_t kMaxVariables = 16;
constexpr std::size_t kStorageBytes = 512;

// The variables of one thread, by number, and their storage. The threads form a list: when the module is unmapped it
// frees the variables of threads that still run.
struct ThreadVariables {
    ThreadVariables* next;
    ThreadVariables** link;
    void* variables[kMaxVariables];
    std::size_t usedBytes;
    alignas(std::max_align_t) std::byte storage[kStorageBytes];
};

// For threads of the host whose first exception is that memory has run out. One in use has a link.
ThreadVariables reserve[8];

struct SlotTraits {
    using Handle = DWORD;
    static Handle none() noexcept
    {
        return TLS_OUT_OF_INDEXES;
    }
    static void free(Handle index) noexcept
    {
        TlsFree(index);
    }
};
using Slot = tavi::UniqueHandle<SlotTraits>;

// Unlike a critical section it needs no clean-up.
SRWLOCK lock = SRWLOCK_INIT;
ThreadVariables* allThreads = nullptr;
std::uintptr_t lastNumber = 0;
std::atomic<DWORD> slot{TLS_OUT_OF_INDEXES};

std::uintptr_t numberOf(Variable& variable) noexcept
{
    if (variable.number == 0) {
        AcquireSRWLockExclusive(&lock);
        if (variable.number == 0)
            variable.number = ++lastNumber;
        ReleaseSRWLockExclusive(&lock);
    }
    return variable.number;
}

// Creates the record of the calling thread; null without memory.
ThreadVariables* addThread() noexcept
{
    auto* thread = static_cast<ThreadVariables*>(std::calloc(1, sizeof(ThreadVariables)));
    AcquireSRWLockExclusive(&lock);
    if (!thread)
        thread = std::find_if(std::begin(reserve), std::end(reserve), [](const auto& spare) { return !spare.link; });
    if (thread == std::end(reserve)) {
        ReleaseSRWLockExclusive(&lock);
        return nullptr;
    }
    thread->next = allThreads;
    thread->link = &allThreads;
    if (allThreads)
        allThreads->link = &thread->next;
    allThreads = thread;
    ReleaseSRWLockExclusive(&lock);
    return thread;
}

void* create(const Variable& variable, ThreadVariables& thread) noexcept
{
    void* created = thread.storage + thread.usedBytes;
    std::size_t free = kStorageBytes - thread.usedBytes;
    if (!std::align(variable.alignment, variable.size, created, free))
        return nullptr;
    thread.usedBytes = kStorageBytes - free + variable.size;
    if (variable.initial)
        std::memcpy(created, variable.initial, variable.size);
    return created;
}

// The thread is in the list no more, or the list is.
void freeVariables(ThreadVariables* thread) noexcept
{
    if (thread >= std::begin(reserve) && thread < std::end(reserve))
        *thread = {};
    else
        std::free(thread);
}

// Returns null if the variable cannot be created.
void* variableOfThread(Variable& variable) noexcept
{
    const DWORD index = tavi::initializeOnce(slot, [] { return Slot(TlsAlloc()); });
    auto* thread = static_cast<ThreadVariables*>(TlsGetValue(index));
    if (!thread) {
        thread = addThread();
        if (!thread || !TlsSetValue(index, thread))
            return nullptr;
    }
    const std::uintptr_t number = numberOf(variable);
    if (number > kMaxVariables)
        return nullptr;
    void*& found = thread->variables[number - 1];
    if (!found)
        found = create(variable, *thread);
    return found;
}

void releaseThread() noexcept
{
    const DWORD index = slot;
    auto* const thread = index == TLS_OUT_OF_INDEXES ? nullptr : static_cast<ThreadVariables*>(TlsGetValue(index));
    if (!thread)
        return;
    TlsSetValue(index, nullptr);
    AcquireSRWLockExclusive(&lock);
    *thread->link = thread->next;
    if (thread->next)
        thread->next->link = thread->link;
    freeVariables(thread);
    ReleaseSRWLockExclusive(&lock);
}

void NTAPI endOfThread(void*, DWORD reason, void*)
{
    tavi::guarded("end of a thread", [&] {
        if (reason == DLL_THREAD_DETACH)
            releaseThread();
    });
}

} // namespace

// Called by the code that the compiler generates for each use of a thread-local variable.
extern "C" void* __emutls_get_address(void* variable); // NOLINT(bugprone-reserved-identifier)
extern "C" void* __emutls_get_address(void* variable)  // NOLINT(bugprone-reserved-identifier)
{
    // The caller may read the error of a system call it made before.
    const DWORD error = GetLastError();
    void* const found = variableOfThread(*static_cast<Variable*>(variable));
    // Like the compiler's own store: without these variables not even an exception can be thrown.
    if (!found)
        std::abort();
    SetLastError(error);
    return found;
}

// The loader calls the functions in this section, ordered by the letters after the $. The runtime's own callbacks,
// whose destructors may use the variables, come earlier.
extern "C" {
[[gnu::section(".CRT$XLX"), gnu::used]] const PIMAGE_TLS_CALLBACK tavishellEndOfThread = endOfThread;
}

namespace tavi {

void releaseAllThreadLocals() noexcept
{
    while (ThreadVariables* const thread = allThreads) {
        allThreads = thread->next;
        freeVariables(thread);
    }
    const Slot released(slot.exchange(TLS_OUT_OF_INDEXES));
}

} // namespace tavi
