#include "core/BackgroundThread.h"

#include <stdexcept>

#include <gtest/gtest.h>
#include <wx/log.h>

#include "core/Handles.h"

namespace tavi {
namespace {

// The body that the thread runs next: how it leaves, and where it waits for the test.
struct Play {
    const KernelHandle entered{CreateSemaphoreW(nullptr, 0, 100, nullptr)};
    const KernelHandle leave{CreateSemaphoreW(nullptr, 0, 100, nullptr)};
    std::atomic<int> bodies{0};
    std::atomic<DWORD> thread{0};
    std::atomic<bool> sawStop{false};
    std::atomic<bool> fails{false};
};
Play* play;

BackgroundThread subject("test", [](const BackgroundThread& self) {
    ++play->bodies;
    play->thread = GetCurrentThreadId();
    ReleaseSemaphore(play->entered.get(), 1, nullptr);
    WaitForSingleObject(play->leave.get(), 10000);
    play->sawStop = self.isStopping();
    if (play->fails)
        throw std::runtime_error("a failing body");
});

bool happens(const KernelHandle& event)
{
    return WaitForSingleObject(event.get(), 10000) == WAIT_OBJECT_0;
}

// Lets the body return and waits until its thread has ended.
void letEnd()
{
    const KernelHandle thread(subject.releaseHandle());
    ReleaseSemaphore(play->leave.get(), 1, nullptr);
    EXPECT_TRUE(happens(thread));
    EXPECT_FALSE(subject.isActive());
}

TEST(BackgroundThread, ExistsOnceAndTakesAStopRequestBack)
{
    Play played;
    play = &played;
    EXPECT_FALSE(subject.isActive());
    subject.requestStop(); // nothing to stop
    for (int again = 0; again < 3; ++again)
        subject.start();
    ASSERT_TRUE(happens(played.entered));

    // Withdrawn before the body has looked: it never notices, and runs again since it has returned all the same.
    const DWORD first = played.thread;
    subject.requestStop();
    EXPECT_TRUE(subject.isStopping());
    subject.start();
    EXPECT_FALSE(subject.isStopping());
    ReleaseSemaphore(played.leave.get(), 1, nullptr);
    ASSERT_TRUE(happens(played.entered));
    EXPECT_FALSE(played.sawStop);
    EXPECT_EQ(played.bodies, 2);
    EXPECT_EQ(played.thread, first) << "a second thread would compete with the first";

    subject.requestStop();
    letEnd();
    EXPECT_TRUE(played.sawStop);
    EXPECT_EQ(played.bodies, 2);

    // One that has ended, by request or by a failure, is started anew.
    played.fails = true;
    subject.start();
    ASSERT_TRUE(happens(played.entered));
    const wxLogNull quiet;
    letEnd();
    played.fails = false;
    subject.start();
    ASSERT_TRUE(happens(played.entered));
    subject.requestStop();
    letEnd();
    EXPECT_EQ(played.bodies, 4);
}

} // namespace
} // namespace tavi
