#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <vector>

#include "Platform/CallFilter.h"
#include "Platform/Time.h"
#include "Platform/WaitableObjects.h"
#include "TestThread.h"

namespace Varnholt::Platform {

void PrintTo(WaitResult result, std::ostream* stream) {
    *stream << "wait result " << static_cast<std::uint32_t>(result);
}

namespace {

std::uint32_t MillisecondsSince(std::uint32_t start) {
    return TickCount() - start;
}

TEST(Events, SatisfyOneWaitPerSignal) {
    const OwnedHandle event(MakeAutoResetEvent());
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::TimedOut);
    EXPECT_TRUE(SignalEvent(event.Get()));
    EXPECT_TRUE(SignalEvent(event.Get()));
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::Signalled);
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::TimedOut);
}

TEST(Events, SignalsInARowEndAsManyWaits) {
    constexpr int Threads = 4;
    const OwnedHandle event(MakeAutoResetEvent());
    const OwnedHandle ready(MakeSemaphore(0, Threads, ""));
    std::atomic<int> ended = 0;
    const auto body = [&] {
        ReleaseSemaphore(ready.Get(), 1);
        EXPECT_EQ(Wait(event.Get(), LongTimeout), WaitResult::Signalled);
        ++ended;
    };
    TestThread threads[Threads]{TestThread(body), TestThread(body), TestThread(body), TestThread(body)};
    for (int i = 0; i < Threads; ++i) {
        ASSERT_EQ(Wait(ready.Get(), LongTimeout), WaitResult::Signalled);
    }
    SleepMilliseconds(50);  // between saying so and waiting lies nothing else
    for (int i = 0; i < Threads; ++i) {
        SignalEvent(event.Get());
    }
    for (TestThread& thread : threads) {
        thread.Join();
    }
    EXPECT_EQ(ended, Threads);
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::TimedOut);
}

TEST(Waits, LastAsLongAsTheirTimeout) {
    const OwnedHandle event(MakeAutoResetEvent());
    const std::uint32_t start = TickCount();
    EXPECT_EQ(Wait(event.Get(), 60), WaitResult::TimedOut);
    EXPECT_GE(MillisecondsSince(start), 59u);
    EXPECT_LT(MillisecondsSince(start), 5000u);
}

TEST(Waits, RefuseWhatIsNoHandle) {
    OwnedHandle closed(MakeAutoResetEvent());
    const Handle gone = closed.Get();
    closed.Reset();
    int local = 0;
    for (const Handle handle : {NoHandle, InvalidHandle(), static_cast<Handle>(&local), gone}) {
        SetLastError(0);
        EXPECT_EQ(Wait(handle, 0), WaitResult::Failed);
        EXPECT_EQ(LastError(), Errors::InvalidHandle);
        EXPECT_FALSE(SignalEvent(handle));
        EXPECT_FALSE(ReleaseMutex(handle));
        EXPECT_FALSE(ReleaseSemaphore(handle, 1));
    }
    SetLastError(0);
    EXPECT_FALSE(Close(gone));
    EXPECT_EQ(LastError(), Errors::InvalidHandle);
}

TEST(Mutexes, AreRecursiveAndBelongToAThread) {
    for (const std::string name : {"", "ostra-test-mutex"}) {
        const OwnedHandle mutex(MakeMutex(name));
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
        EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        TestThread([&] {
            EXPECT_EQ(Wait(mutex.Get(), 10), WaitResult::TimedOut);
            EXPECT_FALSE(ReleaseMutex(mutex.Get()));
            EXPECT_EQ(LastError(), Errors::NotOwner);
        }).Join();
        EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        TestThread([&] {
            EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
            EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        }).Join();
        EXPECT_FALSE(ReleaseMutex(mutex.Get()));
        EXPECT_EQ(LastError(), Errors::NotOwner);
    }
}

}  // namespace
}  // namespace Varnholt::Platform
