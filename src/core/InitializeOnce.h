#pragma once

#include <atomic>

namespace tavi {

// Returns the value in `place`, which is created on its first use. `create` returns an owner of a new value, such as a
// UniqueHandle; if it owns nothing, the next call tries again. If threads meet, each creates a value, and one is kept.
//
// Not a local static: threads that meet in the guard of one make the C++ runtime create two semaphores and an event,
// which would outlive the module.
template <class Value, class Create>
Value initializeOnce(std::atomic<Value>& place, Create create)
{
    using Owner = decltype(create());
    Value value = place;
    if (value == Owner().get()) {
        Owner created = create();
        if (place.compare_exchange_strong(value, created.get()))
            value = created.release();
    }
    return value;
}

} // namespace tavi
