#include "core/BackgroundThread.h"

#include <wx/log.h>

#include "tests/support/Dialogs.h"

using namespace tavi;
using namespace tavi::test;

namespace {

std::atomic<int> entered{0}, left{0};
std::atomic<DWORD> thread{0};
std::atomic<bool> sawStop{false};

BackgroundThread subject("test", [](const BackgroundThread& self) {
    thread = GetCurrentThreadId();
    const int body = ++entered;
    EXPECT_TRUE(waitUntil([&] { return left == body; }));
    sawStop = self.isStopping();
    if (body == 3)
        throw 1;
});

// Lets the body return and waits for the end of the thread.
void expectEnd()
{
    const KernelHandle ended(subject.releaseHandle());
    left = entered.load();
    EXPECT_EQ(WaitForSingleObject(ended.get(), 60000), WAIT_OBJECT_0);
    EXPECT_FALSE(subject.isActive());
}

TEST(BackgroundThread, RunsOnceUntilItIsStoppedOrThrows)
{
    const wxLogNull quiet;
    subject.start();
    EXPECT_TRUE(waitUntil([] { return entered == 1; }));
    const DWORD first = thread;
    subject.requestStop();
    subject.start();
    EXPECT_FALSE(subject.isStopping());
    left = 1;
    EXPECT_TRUE(waitUntil([] { return entered == 2; })) << "a withdrawn stop runs the body again";
    EXPECT_FALSE(sawStop);
    EXPECT_EQ(thread, first) << "a second thread would compete with the first";
    subject.start();
    subject.requestStop();
    expectEnd();
    EXPECT_TRUE(sawStop);
    EXPECT_EQ(entered, 2);
    subject.requestStop(); // nothing to stop
    EXPECT_FALSE(subject.isStopping());
    subject.start();
    EXPECT_TRUE(waitUntil([] { return entered == 3; }));
    expectEnd();
}

} // namespace
