#include "core/BackgroundThread.h"

#include "core/Boundary.h"
#include "core/ModuleThread.h"

namespace tavi {

void BackgroundThread::start() noexcept
{
    for (State seen = state_; seen != State::running;) {
        if (!state_.compare_exchange_weak(seen, State::running))
            continue;
        if (seen == State::stopping)
            return;
        // Suspended until its handle is stored, for which a stop may wait.
        const HANDLE thread = startModuleThread(run, this, true);
        if (!thread) {
            state_ = State::ended;
            return;
        }
        if (const HANDLE previous = handle_.exchange(thread))
            CloseHandle(previous);
        ResumeThread(thread);
        return;
    }
}

void BackgroundThread::requestStop() noexcept
{
    State running = State::running;
    state_.compare_exchange_strong(running, State::stopping);
}

bool BackgroundThread::end(bool hasFailed) noexcept
{
    if (hasFailed) {
        state_ = State::ended;
        return true;
    }
    // Fails if the stop request was withdrawn after the body had seen it: the body then runs again.
    State stopping = State::stopping;
    return state_.compare_exchange_strong(stopping, State::ended);
}

void BackgroundThread::run(void* self)
{
    auto& thread = *static_cast<BackgroundThread*>(self);
    bool hasFailed = false;
    do {
        hasFailed = true;
        guarded(thread.name_, [&] {
            thread.body_(thread);
            hasFailed = false;
        });
    } while (!thread.end(hasFailed));
}

} // namespace tavi
