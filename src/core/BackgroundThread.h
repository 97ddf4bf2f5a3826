#pragma once

#include <atomic>

#include <windows.h>

namespace tavi {

// A thread of the module that runs at most once at a time. A stop request can be withdrawn until the thread has ended:
// a host that may unload the module may also use it again, and a second thread beside one that is still stopping would
// compete with it for the same pipe and load the same data again.
//
// Lock-free: attach and detach use it under the loader lock, where a wait for a thread that needs that lock would never
// end. Any thread may call every member. Objects must outlive the thread, so they are static.
class BackgroundThread {
  public:
    // Runs on the thread and returns soon after isStopping() has become true.
    using Body = void (*)(const BackgroundThread& self);

    constexpr BackgroundThread(const char* name, Body body) noexcept : name_(name), body_(body) {}
    BackgroundThread(const BackgroundThread&) = delete;
    BackgroundThread& operator=(const BackgroundThread&) = delete;

    // Starts the thread, or withdraws a stop request that the thread has not acted on. If the thread cannot be created,
    // the next call tries again.
    void start() noexcept;
    void requestStop() noexcept;
    bool isStopping() const noexcept
    {
        return state_ == State::stopping;
    }
    // Returns false before the first start and after the thread's last run of the body.
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
