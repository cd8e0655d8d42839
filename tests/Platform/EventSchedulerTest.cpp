#include "EachClock.h"
#include "Platform/RealScheduler.h"
#include "TestThread.h"

namespace Varnholt::Platform {
namespace {

using Schedulers = EachClock;
INSTANTIATE_FOR_EACH_CLOCK(Schedulers);

TEST_P(Schedulers, ForgetEvents) {
    EventScheduler& scheduler = ClockScheduler();
    const std::uint64_t start = scheduler.Now();
    const OwnedHandle done(MakeAutoResetEvent());
    std::atomic<int> called = 0;
    const auto held = std::make_shared<int>();
    const int forgotten = 0;
    scheduler.CallAt(
        start + 60'000'000, [&called, held] { ++called; }, &forgotten);
    scheduler.CallAt(
        start + 70'000'000, [&called, held] { ++called; }, &forgotten);
    SleepMilliseconds(5);  // what comes now is due before that for which a thread waits
    const int own = 0;
    const auto forgetItself = [&] {
        scheduler.CallAt(
            start + 60'000'000, [&called] { ++called; }, &own);
        scheduler.Forget(&own);
        SignalEvent(done.Get());
    };
    scheduler.CallAt(start + 10'000, forgetItself, &own);
    scheduler.Forget(&forgotten);
    EXPECT_EQ(held.use_count(), 1) << "what is forgotten holds nothing any more";
    EXPECT_EQ(Wait(done.Get(), LongTimeout), WaitResult::Signalled);
    scheduler.Forget(&own);
    EXPECT_EQ(called, 0);
}

TEST_P(Schedulers, ForgetReturnsAfterACallThatIsRunning) {
    EventScheduler& scheduler = ClockScheduler();
    const OwnedHandle running(MakeAutoResetEvent()), forgotten(MakeAutoResetEvent());
    std::atomic<bool> over = false;
    const auto event = [&] {
        EXPECT_EQ(SignalAndWait(running.Get(), forgotten.Get(), LongTimeout), WaitResult::Signalled);
        SleepMilliseconds(30);
        // Whoever forgets the owner meanwhile is not to meet this one, either.
        scheduler.CallAt(
            scheduler.Now() + 1'000'000, [] { ADD_FAILURE(); }, &over);
        over = true;
    };
    scheduler.CallAt(scheduler.Now(), event, &over);
    TestThread other([&] {
        EXPECT_EQ(Wait(running.Get(), LongTimeout), WaitResult::Signalled);
        scheduler.Forget(&forgotten);  // does not wait for another owner's call
        SignalEvent(forgotten.Get());
        scheduler.Forget(&over);
        EXPECT_TRUE(over);
    });
}

TEST(RealSchedulers, HaveAThreadOnlyWhileEventsWaitAndEndBeforeThem) {
    static int threads;
    threads = 0;
    RealScheduler scheduler([](std::function<void()> run) {
        ++threads;
        return std::thread(std::move(run));
    });
    for (int i = 0; i < 2; ++i) {
        scheduler.Forget(&threads);
        scheduler.CallAt(
            scheduler.Now() + 60'000'000, [] { ADD_FAILURE(); }, &threads);
    }
    EXPECT_EQ(threads, 2) << "the first has ended with its event";
}

/// Events from several threads that come and go quickly, so that the scheduler's own thread does as well.
TEST_P(Schedulers, CallEveryEventOnce) {
    constexpr int PerThread = 200;
    EventScheduler& scheduler = ClockScheduler();
    std::atomic<int> called = 0;
    const OwnedHandle all(MakeSemaphore(0, 0x7FFFFFFF, ""));
    const auto body = [&] {
        for (int i = 0; i < PerThread; ++i) {
            scheduler.CallAt(scheduler.Now() + static_cast<std::uint64_t>(i % 3) * 100, [&] {
                ++called;
                ReleaseSemaphore(all.Get(), 1);
            });
            scheduler.CallAt(
                scheduler.Now() + 10'000'000, [] { ADD_FAILURE(); }, &i);
            scheduler.Forget(&i);
        }
    };
    {
        TestThread first(body);
        TestThread second(body);
    }
    for (int i = 0; i < 2 * PerThread; ++i) {
        ASSERT_EQ(Wait(all.Get(), LongTimeout), WaitResult::Signalled);
    }
    EXPECT_EQ(called, 2 * PerThread);
}

}  // namespace
}  // namespace Varnholt::Platform
