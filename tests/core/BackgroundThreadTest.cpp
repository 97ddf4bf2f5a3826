#include "core/BackgroundThread.h"

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Handles.h"

namespace tavi {
namespace {

std::atomic<int> bodies{0};
std::atomic<DWORD> thread{0};
std::atomic<bool> sawStop{false};
const KernelHandle entered(CreateSemaphoreW(nullptr, 0, 100, nullptr));
const KernelHandle leave(CreateSemaphoreW(nullptr, 0, 100, nullptr));

BackgroundThread subject("test", [](const BackgroundThread& self) {
    const int body = ++bodies;
    thread = GetCurrentThreadId();
    ReleaseSemaphore(entered.get(), 1, nullptr);
    WaitForSingleObject(leave.get(), 10000);
    sawStop = self.isStopping();
    if (body == 3)
        throw 1;
});

TEST(BackgroundThread, RunsOnceAndItsStopCanBeWithdrawn)
{
    subject.requestStop(); // nothing to stop
    subject.start();
    subject.start();
    ASSERT_EQ(WaitForSingleObject(entered.get(), 10000), WAIT_OBJECT_0);

    // A stop withdrawn before the body has looked at it: the body runs again, because it returned.
    const DWORD first = thread;
    subject.requestStop();
    EXPECT_TRUE(subject.isStopping());
    subject.start();
    EXPECT_FALSE(subject.isStopping());
    ReleaseSemaphore(leave.get(), 1, nullptr);
    ASSERT_EQ(WaitForSingleObject(entered.get(), 10000), WAIT_OBJECT_0);
    EXPECT_FALSE(sawStop);
    EXPECT_EQ(thread, first) << "a second thread would compete with the first";
    subject.requestStop();

    // Once the thread has ended, by request or by an exception, it can be started again.
    const wxLogNull quiet;
    for (int body = 2; body <= 3; ++body) {
        const KernelHandle ended(subject.releaseHandle());
        ReleaseSemaphore(leave.get(), 1, nullptr);
        EXPECT_EQ(WaitForSingleObject(ended.get(), 10000), WAIT_OBJECT_0);
        EXPECT_EQ(sawStop, body == 2);
        EXPECT_FALSE(subject.isActive());
        subject.start();
        ASSERT_EQ(WaitForSingleObject(entered.get(), 10000), WAIT_OBJECT_0);
    }
    EXPECT_EQ(bodies, 4);
    subject.requestStop();
    ReleaseSemaphore(leave.get(), 1, nullptr);
    EXPECT_EQ(WaitForSingleObject(KernelHandle(subject.releaseHandle()).get(), 10000), WAIT_OBJECT_0);
}

} // namespace
} // namespace tavi
