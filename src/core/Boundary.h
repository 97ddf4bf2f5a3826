#pragma once

#include <utility>

namespace tavi {

// Logs the exception being handled under the entry's name. To be called only inside a catch block.
void logEscaped(const char* entry) noexcept;

// Runs the body of an entry point: an export, COM method, window procedure, thread routine or callback. Logs whatever
// it throws and returns the neutral result, so that no exception unwinds into the host.
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
