#pragma once

#include <utility>

namespace tavi {

// Writes the exception being handled to the log under the entry's name. Never throws; call inside a catch block only.
void logEscaped(const char* entry) noexcept;

// The outermost handler of every way into the module: exports, COM methods, window procedures, thread routines and
// callbacks. Whatever the body throws is logged and answered with the neutral result, so that nothing unwinds into the
// host.
template <class Result, class Body>
Result guarded(const char* entry, Result neutral, Body&& body) noexcept
{
    try {
        return std::forward<Body>(body)();
    } catch (...) {
        logEscaped(entry);
        return neutral;
    }
}

template <class Body>
void guarded(const char* entry, Body&& body) noexcept
{
    try {
        std::forward<Body>(body)();
    } catch (...) {
        logEscaped(entry);
    }
}

} // namespace tavi
