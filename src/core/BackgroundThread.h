#pragma once

#include <atomic>

#include <windows.h>

namespace tavi {

// A thread of the module that exists at most once, and that can be asked to stop and then, until it has ended, to carry
// on. The host may answer a permission to unload by using the module again: a second thread beside one that is still
// stopping would compete with it for the same pipe, and would load again what is already in memory.
//
// Lock-free: the detach at the end of a process may use it although another thread was killed at any instruction.
// Every member may be called by any thread. Objects must outlive the thread, so they are static.
class BackgroundThread {
  public:
    // Runs on the thread and returns soon after isStopping() has become true.
    using Body = void (*)(const BackgroundThread& self);

    constexpr BackgroundThread(const char* name, Body body) noexcept : name_(name), body_(body) {}
    BackgroundThread(const BackgroundThread&) = delete;
    BackgroundThread& operator=(const BackgroundThread&) = delete;

    // Starts the thread, or withdraws a stop request that it has not acted on yet. If the thread cannot be created the
    // next call tries again.
    void start() noexcept;
    void requestStop() noexcept;
    bool isStopping() const noexcept
    {
        return state_ == State::stopping;
    }
    // False before the first start and once the body has returned for good.
    bool isActive() const noexcept
    {
        return state_ != State::ended;
    }
    // Passes the handle of the thread that was started last to the caller, who closes it; null if there is none.
    HANDLE releaseHandle() noexcept
    {
        return handle_.exchange(nullptr);
    }

  private:
    enum class State { ended, running, stopping };

    static void run(void* self);
    bool end(bool hasFailed) noexcept;

    const char* const name_;
    const Body body_;
    std::atomic<State> state_{State::ended};
    std::atomic<HANDLE> handle_{nullptr};
};

} // namespace tavi
