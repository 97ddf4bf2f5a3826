#pragma once

#include <atomic>

namespace tavi {

// Returns the value in `place`, which is created on its first use. `create` returns an owner of a new value, such as a
// UniqueHandle; if it owns nothing, the next call tries again. If several
// threads call it at once, each may create a value, and one is kept.
//
// Not a local static: if several threads reach the guard of one at once, the C++ runtime creates two semaphores and an
// event, which would outlive the module.
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
