#include "core/BackgroundThread.h"

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Handles.h"

namespace tavi {
namespace {

std::atomic<int> bodies{0};
std::atomic<DWORD> thread{0};
std::atomic<bool> sawStop{false}, throws{false};
const KernelHandle entered(CreateSemaphoreW(nullptr, 0, 100, nullptr));
const KernelHandle leave(CreateSemaphoreW(nullptr, 0, 100, nullptr));

bool waitFor(const KernelHandle& handle)
{
    return WaitForSingleObject(handle.get(), 60000) == WAIT_OBJECT_0;
}

BackgroundThread subject("test", [](const BackgroundThread& self) {
    thread = GetCurrentThreadId();
    ++bodies;
    ReleaseSemaphore(entered.get(), 1, nullptr);
    waitFor(leave);
    sawStop = self.isStopping();
    if (throws.exchange(false))
        throw 1;
});

// Starts the thread, whose body waits.
struct BackgroundThreads : testing::Test {
    BackgroundThreads()
    {
        bodies = 0;
        subject.start();
        EXPECT_TRUE(waitFor(entered));
    }
    // Lets the body return and waits for the end of the thread.
    static void expectEnd()
    {
        const KernelHandle ended(subject.releaseHandle());
        ReleaseSemaphore(leave.get(), 1, nullptr);
        EXPECT_TRUE(waitFor(ended));
        EXPECT_FALSE(subject.isActive());
    }
};

TEST_F(BackgroundThreads, RunOnceUntilTheyAreStopped)
{
    subject.start();
    subject.requestStop();
    expectEnd();
    EXPECT_TRUE(sawStop);
    EXPECT_EQ(bodies, 1);
    subject.requestStop(); // nothing to stop
    EXPECT_FALSE(subject.isStopping());
}

TEST_F(BackgroundThreads, RunAgainOnTheSameThreadIfTheStopIsWithdrawn)
{
    const DWORD first = thread;
    subject.requestStop();
    subject.start();
    EXPECT_FALSE(subject.isStopping());
    ReleaseSemaphore(leave.get(), 1, nullptr);
    EXPECT_TRUE(waitFor(entered));
    EXPECT_FALSE(sawStop);
    EXPECT_EQ(thread, first) << "a second thread would compete with the first";
    subject.requestStop();
    expectEnd();
}

TEST_F(BackgroundThreads, EndAfterAnException)
{
    const wxLogNull quiet;
    throws = true;
    expectEnd();
}

} // namespace
} // namespace tavi
