#include "core/BackgroundThread.h"

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Handles.h"

using namespace tavi;

static std::atomic<int> bodies{0};
static std::atomic<DWORD> thread{0};
static std::atomic<bool> sawStop{false};
static const KernelHandle entered(CreateSemaphoreW(nullptr, 0, 100, nullptr));
static const KernelHandle leave(CreateSemaphoreW(nullptr, 0, 100, nullptr));

static bool waitFor(const KernelHandle& handle)
{
    return WaitForSingleObject(handle.get(), 60000) == WAIT_OBJECT_0;
}

static BackgroundThread subject("test", [](const BackgroundThread& self) {
    thread = GetCurrentThreadId();
    const int body = ++bodies;
    ReleaseSemaphore(entered.get(), 1, nullptr);
    waitFor(leave);
    sawStop = self.isStopping();
    if (body == 3)
        throw 1;
});

TEST(BackgroundThread, RunsOnceAndItsStopCanBeWithdrawn)
{
    subject.requestStop(); // nothing to stop
    subject.start();
    subject.start();
    ASSERT_TRUE(waitFor(entered));
    const DWORD first = thread;
    subject.requestStop();
    EXPECT_TRUE(subject.isStopping());
    subject.start(); // before the body has looked at the stop: it runs again, because it returned
    EXPECT_FALSE(subject.isStopping());
    ReleaseSemaphore(leave.get(), 1, nullptr);
    ASSERT_TRUE(waitFor(entered));
    EXPECT_TRUE(!sawStop && thread == first) << "a second thread would compete with the first";

    // Once the thread has ended, by request or by an exception, it can be started again.
    const wxLogNull quiet;
    for (int body = 2; body <= 4; ++body) {
        if (body != 3)
            subject.requestStop();
        const KernelHandle ended(subject.releaseHandle());
        ReleaseSemaphore(leave.get(), 1, nullptr);
        EXPECT_TRUE(waitFor(ended) && !subject.isActive() && sawStop == (body != 3)) << body;
        if (body < 4)
            subject.start();
        EXPECT_TRUE(body == 4 || waitFor(entered));
    }
}
