#include "EachClock.h"
#include "TestThread.h"

namespace Varnholt::Platform {
namespace {

using Threads = EachClock;
INSTANTIATE_FOR_EACH_CLOCK(Threads);

TEST_P(Threads, RememberTheirPriority) {
    EXPECT_EQ(CurrentThreadPriority(), 0);
    for (const int level : {HighestThreadPriority, -HighestThreadPriority, 1, 0}) {
        EXPECT_TRUE(SetCurrentThreadPriority(level));
        EXPECT_EQ(CurrentThreadPriority(), level);
        TestThread([] { EXPECT_EQ(CurrentThreadPriority(), 0) << "a priority is one thread's"; }).Join();
    }
    EXPECT_EQ(ErrorOf(SetCurrentThreadPriority(HighestThreadPriority + 1)), Errors::InvalidParameter);
    EXPECT_EQ(CurrentThreadPriority(), 0);
}

TEST(ThreadsOfTheHost, AbandonWhatTheyOwnAtTheirEnd) {
    const OwnedHandle mutex(MakeMutex(""));
    std::thread([&] { Wait(mutex.Get(), 0); }).join();
    EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Abandoned);
}

/// A caller that forces a thread to its end must be able to rely on the answer.
TEST_P(Threads, EndByForceOrSayThatTheyCannot) {
    const OwnedHandle leave(MakeAutoResetEvent());
    std::atomic<bool> left = false;
    TestThread thread([&] {
        Wait(leave.Get(), LongTimeout);
        left = true;
    });
    SleepMilliseconds(20);
    EXPECT_FALSE(thread.HasEnded() || left) << "who asks without waiting does not wait";
    const ErrorCode code = ErrorOf(EndThreadByForce(thread.Get(), 0xFFFFFFFF));
    SignalEvent(leave.Get());
    thread.Join();
    EXPECT_EQ(code, left ? Errors::NotSupported : Errors::Success);
    EXPECT_EQ(ErrorOf(EndThreadByForce(NoHandle, 0)), Errors::InvalidHandle);
}

}  // namespace
}  // namespace Varnholt::Platform
