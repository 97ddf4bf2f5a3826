#include "core/BackgroundThread.h"

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Handles.h"

using namespace tavi;

namespace {

std::atomic<int> bodies{0};
std::atomic<DWORD> thread{0};
std::atomic<bool> sawStop{false};
const KernelHandle entered(CreateSemaphoreW(nullptr, 0, 100, nullptr));
const KernelHandle leave(CreateSemaphoreW(nullptr, 0, 100, nullptr));

bool waitFor(const KernelHandle& handle)
{
    return WaitForSingleObject(handle.get(), 60000) == WAIT_OBJECT_0;
}

BackgroundThread subject("test", [](const BackgroundThread& self) {
    thread = GetCurrentThreadId();
    const int body = ++bodies;
    ReleaseSemaphore(entered.get(), 1, nullptr);
    waitFor(leave);
    sawStop = self.isStopping();
    if (body == 3)
        throw 1;
});

// Lets the body return and waits for the end of the thread.
void expectEnd()
{
    const KernelHandle ended(subject.releaseHandle());
    ReleaseSemaphore(leave.get(), 1, nullptr);
    EXPECT_TRUE(waitFor(ended));
    EXPECT_FALSE(subject.isActive());
}

TEST(BackgroundThread, RunsOnceUntilItIsStoppedOrThrows)
{
    const wxLogNull quiet;
    subject.start();
    EXPECT_TRUE(waitFor(entered));
    const DWORD first = thread;
    subject.requestStop();
    subject.start();
    EXPECT_FALSE(subject.isStopping());
    ReleaseSemaphore(leave.get(), 1, nullptr);
    EXPECT_TRUE(waitFor(entered)) << "a withdrawn stop runs the body again";
    EXPECT_FALSE(sawStop);
    EXPECT_EQ(thread, first) << "a second thread would compete with the first";
    subject.start();
    subject.requestStop();
    expectEnd();
    EXPECT_TRUE(sawStop);
    EXPECT_EQ(bodies, 2);
    subject.requestStop(); // nothing to stop
    EXPECT_FALSE(subject.isStopping());
    subject.start();
    EXPECT_TRUE(waitFor(entered));
    expectEnd();
}

} // namespace
