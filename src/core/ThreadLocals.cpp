#include "core/ThreadLocals.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include <windows.h>
#include <malloc.h>

#include "core/Boundary.h"

namespace {

// The compiler's description of a variable, in the compiler's layout.
struct Variable {
    std::size_t size;
    std::size_t alignment;
    // 0 until the first use of the variable.
    std::atomic<std::uintptr_t> number;
    const void* initial;
};

// The variables of one thread, by number. The threads form a list: when the module is unmapped it frees the variables
// of threads that still run.
struct ThreadVariables {
    ThreadVariables* next;
    ThreadVariables** link;
    std::uintptr_t count;
    void* variables[1];
};

// Unlike a critical section it needs no clean-up.
SRWLOCK lock = SRWLOCK_INIT;
ThreadVariables* allThreads = nullptr;
std::atomic<std::uintptr_t> lastNumber{0};
std::atomic<DWORD> slot{TLS_OUT_OF_INDEXES};

DWORD slotOfThreads() noexcept
{
    DWORD index = slot;
    if (index != TLS_OUT_OF_INDEXES)
        return index;
    const DWORD created = TlsAlloc();
    if (created == TLS_OUT_OF_INDEXES)
        std::abort();
    if (slot.compare_exchange_strong(index, created))
        return created;
    TlsFree(created);
    return index;
}

std::uintptr_t numberOf(Variable& variable) noexcept
{
    std::uintptr_t number = variable.number;
    if (number != 0)
        return number;
    const std::uintptr_t next = ++lastNumber;
    return variable.number.compare_exchange_strong(number, next) ? next : number;
}

// The caller holds the lock.
void removeFromList(const ThreadVariables& thread) noexcept
{
    *thread.link = thread.next;
    if (thread.next)
        thread.next->link = thread.link;
}

// Returns a copy with room for a few more variables than needed, or null. A thread needs this once or twice.
ThreadVariables* grow(ThreadVariables* before, std::uintptr_t count) noexcept
{
    const std::size_t capacity = count + 4;
    auto* const grown =
        static_cast<ThreadVariables*>(std::calloc(1, sizeof(ThreadVariables) + capacity * sizeof(void*)));
    if (!grown)
        return nullptr;
    grown->count = capacity;
    AcquireSRWLockExclusive(&lock);
    if (before) {
        std::memcpy(grown->variables, before->variables, before->count * sizeof(void*));
        removeFromList(*before);
    }
    grown->next = allThreads;
    grown->link = &allThreads;
    if (allThreads)
        allThreads->link = &grown->next;
    allThreads = grown;
    ReleaseSRWLockExclusive(&lock);
    std::free(before);
    return grown;
}

void* create(const Variable& variable) noexcept
{
    void* const created = _aligned_malloc(variable.size, variable.alignment);
    if (created && variable.initial)
        std::memcpy(created, variable.initial, variable.size);
    else if (created)
        std::memset(created, 0, variable.size);
    return created;
}

void freeVariables(ThreadVariables* thread) noexcept
{
    for (std::uintptr_t i = 0; i < thread->count; ++i)
        _aligned_free(thread->variables[i]);
    std::free(thread);
}

void* variableOfThread(Variable& variable) noexcept
{
    const DWORD index = slotOfThreads();
    const std::uintptr_t number = numberOf(variable);
    auto* thread = static_cast<ThreadVariables*>(TlsGetValue(index));
    if (!thread || thread->count < number) {
        thread = grow(thread, number);
        // Like the compiler's own store: without these variables not even an exception can be thrown.
        if (!thread || !TlsSetValue(index, thread))
            std::abort();
    }
    void*& found = thread->variables[number - 1];
    if (!found && !(found = create(variable)))
        std::abort();
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
    removeFromList(*thread);
    ReleaseSRWLockExclusive(&lock);
    freeVariables(thread);
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
    if (const DWORD index = slot.exchange(TLS_OUT_OF_INDEXES); index != TLS_OUT_OF_INDEXES)
        TlsFree(index);
}

} // namespace tavi
