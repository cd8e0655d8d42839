#include <gmock/gmock.h>

#include <set>
#include <string>

#include "Platform/EventScheduler.h"
#include "TestThread.h"
#include "VirtualClock.h"

namespace Varnholt::Platform {
namespace {

using Simulator::VirtualClock;

/// Three threads note their steps; which steps follow on which is the seed's choice and nobody else's.
std::string OrderOfSteps(std::uint64_t seed) {
    const VirtualClock clock(seed);
    RecursiveMutex section;
    std::string order;
    const auto body = [&](char name) {
        for (int i = 0; i < 7; ++i) {
            const std::lock_guard holder(section);
            order += name;
        }
    };
    {
        TestThread first([&] { body('a'); });
        TestThread second([&] { body('b'); });
        TestThread third([&] { body('c'); });
    }
    return order;
}

TEST(VirtualTime, SeedDecidesTheOrderOfThreadsAndOfWhatMeets) {
    std::set<std::string> orders;
    std::set<WaitResult> results;
    for (std::uint64_t seed = 0; seed < 20; ++seed) {
        const std::string order = OrderOfSteps(seed);
        EXPECT_EQ(order.size(), 21u);
        EXPECT_EQ(order, OrderOfSteps(seed)) << "seed " << seed;
        orders.insert(order);
        // A time-out and an event at one time.
        const VirtualClock clock(seed);
        const OwnedHandle event(MakeAutoResetEvent());
        ClockScheduler().CallAt(ClockScheduler().Now() + 1000, [&] { SignalEvent(event.Get()); });
        results.insert(Wait(event.Get(), 1));
        SleepMilliseconds(1);
    }
    EXPECT_GT(orders.size(), 15u);
    EXPECT_EQ(results, (std::set{WaitResult::Signalled, WaitResult::TimedOut}));
}

TEST(VirtualTime, DeadlockIsReportedAtOnce) {
    VirtualClock clock(1);
    std::string report;
    clock.HandleDeadlock([&](const std::string& text) { report = text; });
    const OwnedHandle first(MakeMutex(""));
    const OwnedHandle second(MakeMutex(""));
    WaitResult ofOther{};
    EXPECT_EQ(Wait(first.Get(), Infinite), WaitResult::Signalled);
    TestThread other([&] {
        Wait(second.Get(), Infinite);
        ofOther = Wait(first.Get(), Infinite);
    });
    SleepMilliseconds(1);
    EXPECT_EQ(Wait(second.Get(), Infinite), WaitResult::Failed);
    EXPECT_EQ(clock.ElapsedMilliseconds(), 1u);
    EXPECT_THAT(report, testing::HasSubstr("(made the clock) waits for a mutex owned by thread "));
    other.Join();
    EXPECT_EQ(ofOther, WaitResult::Failed);
}

}  // namespace
}  // namespace Varnholt::Platform
