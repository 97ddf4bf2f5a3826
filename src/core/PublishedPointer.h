#pragma once

#include <atomic>
#include <cstdint>

#include "core/RefCounted.h"

namespace tavi {

// One reference-counted object that any thread may take a reference to while another replaces it: a reader gets the old
// or the new object whole, never waits, and never touches one that has been freed.
//
// Not a lock: a reader is often the file manager's own thread in a menu, which must not wait for a writer that has been
// suspended, and detach runs when a thread may have been terminated inside a lock.
//
// A plain pointer cannot do that: the object may be destroyed between the load of the pointer and the AddRef. So the
// word holds the pointer and the number of readers that are between those two steps. The thread that replaces the
// object adds that number to the object's own count before it releases the word's reference; a reader that finds its
// pointer replaced releases the reference that was added for it. The reader may do so before the other thread has added
// it: a published object therefore holds a reserve of references until it has been replaced.
//
// Object is a RefCounted with an atomic count. An object may be published only once.
template <class Object>
class PublishedPointer {
  public:
    PublishedPointer() noexcept = default;
    PublishedPointer(const PublishedPointer&) = delete;
    PublishedPointer& operator=(const PublishedPointer&) = delete;
    ~PublishedPointer()
    {
        replace({});
    }

    // Returns the current object, or null.
    RefPtr<Object> acquire() noexcept
    {
        Word word = word_.load(std::memory_order_relaxed);
        do {
            if (!object(word))
                return {};
        } while (!word_.compare_exchange_weak(word, word + 1, std::memory_order_acq_rel, std::memory_order_relaxed));
        Object* const taken = object(word);
        taken->AddRef();

        word = word_.load(std::memory_order_relaxed);
        while (object(word) == taken) {
            if (word_.compare_exchange_weak(word, word - 1, std::memory_order_acq_rel, std::memory_order_relaxed))
                return RefPtr<Object>::adopt(taken);
        }
        taken->Release();
        // NOLINTNEXTLINE(clang-analyzer-cplusplus.NewDelete): the checker does not count references.
        return RefPtr<Object>::adopt(taken);
    }

    // Publishes `next`, which may be null, and releases the object before it.
    void replace(RefPtr<Object> next) noexcept
    {
        if (next)
            next->addRefs(kReserve);
        const Word before = word_.exchange(pack(next.release()), std::memory_order_acq_rel);
        if (Object* const old = object(before)) {
            old->addRefs(static_cast<int>(before & kReaders) - kReserve);
            old->Release();
        }
    }

  private:
    using Word = std::uint64_t;
    // User-space pointers have at most 48 bits. The rest counts readers, of which each thread is one at most.
    static constexpr unsigned kCountBits = 16;
    static constexpr Word kReaders = (Word{1} << kCountBits) - 1;
    static constexpr int kReserve = 1 << kCountBits;
    static_assert(std::atomic<Word>::is_always_lock_free, "readers must not wait");

    static Object* object(Word word) noexcept
    {
        return reinterpret_cast<Object*>(static_cast<std::uintptr_t>(word >> kCountBits));
    }
    static Word pack(Object* object) noexcept
    {
        return static_cast<Word>(reinterpret_cast<std::uintptr_t>(object)) << kCountBits;
    }

    std::atomic<Word> word_{0};
};

} // namespace tavi
