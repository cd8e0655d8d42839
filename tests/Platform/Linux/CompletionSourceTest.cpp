#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <memory>
#include <thread>

#include "Platform/EventScheduler.h"
#include "Platform/Linux/CompletionSource.h"
#include "Platform/Time.h"
#include "Platform/WaitableObjects.h"
#include "TestThread.h"

namespace Varnholt::Platform {
namespace {

constexpr std::uint64_t AnHour = 3'600'000'000;

/// What the waits of a thread do with the source that it has set to work. Real time only: in virtual time
/// events run on waiting threads anyway.
struct WorkedOffInWaits : testing::Test {
    WorkedOffInWaits() { Linux::WorkOffInWaits({}); }
    ~WorkedOffInWaits() override {
        // Which sees the scheduler's thread to its end.
        scheduler.Forget(scheduler.CallAt(scheduler.Now() + AnHour, [] {}));
        Linux::WorkOffInWaits({});
    }

    EventScheduler& scheduler = ClockScheduler();
    const OwnedHandle done{MakeAutoResetEvent()};
    const OwnedHandle other{MakeAutoResetEvent()};
};

TEST_F(WorkedOffInWaits, AnEventRunsOnTheThreadThatWaitsForIt) {
    const auto self = std::this_thread::get_id();
    int own = 0;
    for (int i = 0; i < 50; ++i) {
        scheduler.CallAt(scheduler.Now() + 300, [&] {
            own += std::this_thread::get_id() == self ? 1 : 0;
            SignalEvent(done.Get());
        });
        ASSERT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled);
    }
    EXPECT_GT(own, 0) << "how many depends on the machine's other work";
}

TEST_F(WorkedOffInWaits, AWaitForSeveralObjectsLeavesEventsToTheirOwnThread) {
    const auto self = std::this_thread::get_id();
    std::thread::id runner = self;
    scheduler.CallAt(scheduler.Now() + 300, [&] {
        runner = std::this_thread::get_id();
        SignalEvent(done.Get());
    });
    const std::array handles{other.Get(), done.Get()};
    ASSERT_EQ(WaitAny(handles, LongTimeout).result, WaitResult::Signalled);
    EXPECT_NE(runner, self);
}

/// A thread that has entered the source still hears of everything else.
TEST_F(WorkedOffInWaits, AFarEventHoldsNothingUp) {
    const auto far = scheduler.CallAt(scheduler.Now() + AnHour, [] {});
    const std::uint64_t start = scheduler.Now();
    EXPECT_EQ(Wait(done.Get(), 30), WaitResult::TimedOut);
    {
        const TestThread signaller([&] {
            SleepMilliseconds(20);
            SignalEvent(done.Get());
        });
        EXPECT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled);
    }
    {
        // Nearer events of another thread, which does not wait itself.
        const TestThread caller([&] {
            SleepMilliseconds(20);
            scheduler.CallAt(scheduler.Now(), [&] { SignalEvent(done.Get()); });
        });
        EXPECT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled);
    }
    {
        // The only event is taken away, and a new one comes.
        const TestThread caller([&] {
            SleepMilliseconds(20);
            scheduler.Forget(far);
            scheduler.CallAt(scheduler.Now() + 1000, [&] { SignalEvent(done.Get()); });
        });
        EXPECT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled);
    }
    EXPECT_LT(scheduler.Now() - start, LongTimeout * 1000);
}

/// Threads that all work off and wake each other: no event and no signal is lost.
TEST_F(WorkedOffInWaits, ManyThreadsLoseNothing) {
    constexpr int Threads = 4;
    constexpr int Rounds = 300;
    std::array<OwnedHandle, Threads> turns;
    for (OwnedHandle& turn : turns) {
        turn = OwnedHandle(MakeSemaphore(0, Rounds, ""));
    }
    std::atomic<int> called = 0;
    const auto body = [&](std::size_t index) {
        for (int i = 0; i < Rounds; ++i) {
            const OwnedHandle own(MakeAutoResetEvent());
            scheduler.CallAt(scheduler.Now() + static_cast<std::uint64_t>(i % 4) * 50, [&] {
                ++called;
                SignalEvent(own.Get());
            });
            ASSERT_EQ(Wait(own.Get(), LongTimeout), WaitResult::Signalled);
            ReleaseSemaphore(turns[(index + 1) % Threads].Get(), 1);
            ASSERT_EQ(Wait(turns[index].Get(), LongTimeout), WaitResult::Signalled);
        }
    };
    {
        std::array<std::unique_ptr<TestThread>, Threads> threads;
        for (std::size_t i = 0; i < Threads; ++i) {
            threads[i] = std::make_unique<TestThread>([&body, i] { body(i); });
        }
    }
    EXPECT_EQ(called, Threads * Rounds);
}

/// The last event is forgotten, which waits for the scheduler's thread to end, while a new one comes that is
/// far off: neither waits for the other.
TEST_F(WorkedOffInWaits, ForgettingDoesNotWaitForEventsThatCome) {
    constexpr int Rounds = 2000;
    std::atomic<int> round = 0;
    const TestThread forgetting([&] {
        for (int i = 1; i <= Rounds; ++i) {
            const auto own = scheduler.CallAt(scheduler.Now() + AnHour, [] {});
            round = i;
            scheduler.Forget(own);
            ASSERT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled) << "round " << i;
        }
    });
    for (int i = 1; i <= Rounds; ++i) {
        while (round < i) {
            std::this_thread::yield();
        }
        const auto far = scheduler.CallAt(scheduler.Now() + AnHour, [] {});
        SignalEvent(done.Get());
        const std::uint64_t limit = scheduler.Now() + 5'000'000;
        while (i < Rounds && round == i && scheduler.Now() < limit) {
            std::this_thread::yield();
        }
        scheduler.Forget(far);
        if (i < Rounds) {
            ASSERT_GT(round, i) << "it waits for an event of another";
        }
    }
}

}  // namespace
}  // namespace Varnholt::Platform
