#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Platform/EventScheduler.h"
#include "Platform/Time.h"
#include "TestThread.h"
#include "VirtualClock.h"

namespace Varnholt::Platform {
namespace {

using Simulator::VirtualClock;
using testing::ElementsAre;
using testing::HasSubstr;

TEST(VirtualTime, PassesWhileAllWait) {
    const auto realStart = std::chrono::steady_clock::now();
    VirtualClock clock(1);
    const OwnedHandle event(MakeAutoResetEvent());
    const std::uint32_t ticks = TickCount();
    const std::uint64_t counter = PerformanceCounter();
    const WallTime wall = WallClockNow();
    EXPECT_EQ(Wait(event.Get(), 5000), WaitResult::TimedOut);
    SleepMilliseconds(3'600'500);
    EXPECT_EQ(clock.ElapsedMicroseconds(), 3'605'500'000u);
    EXPECT_EQ(TickCount() - ticks, 3'605'500u);
    EXPECT_EQ((PerformanceCounter() - counter) / PerformanceFrequency(), 3605u);
    EXPECT_EQ(WallClockNow().seconds - wall.seconds, 3605);
    EXPECT_EQ(WallClockNow().milliseconds, wall.milliseconds + 500);
    EXPECT_LT(std::chrono::steady_clock::now() - realStart, std::chrono::seconds(5));
}

/// Three threads note their steps; which steps follow on which is the seed's choice and nobody else's.
std::string OrderOfSteps(std::uint64_t seed) {
    VirtualClock clock(seed);
    RecursiveMutex section;
    std::string order;
    const auto body = [&](char name) {
        for (int i = 0; i < 6; ++i) {
            const std::lock_guard holder(section);
            order += name;
        }
        SleepMilliseconds(1);
        const std::lock_guard holder(section);
        order += name;
    };
    {
        TestThread first([&] { body('a'); });
        TestThread second([&] { body('b'); });
        TestThread third([&] { body('c'); });
    }
    return order;
}

TEST(VirtualTime, SeedDecidesTheOrderOfThreads) {
    std::set<std::string> orders;
    for (std::uint64_t seed = 0; seed < 20; ++seed) {
        const std::string order = OrderOfSteps(seed);
        EXPECT_EQ(order.size(), 21u);
        EXPECT_EQ(order, OrderOfSteps(seed)) << "seed " << seed;
        orders.insert(order);
    }
    EXPECT_GT(orders.size(), 15u);
}

TEST(VirtualTime, SeedDecidesBetweenTimeoutAndEventAtOneTime) {
    std::set<WaitResult> results;
    for (std::uint64_t seed = 0; seed < 20; ++seed) {
        VirtualClock clock(seed);
        const OwnedHandle event(MakeAutoResetEvent());
        ClockScheduler().CallAt(ClockScheduler().Now() + 1000, [&] { SignalEvent(event.Get()); });
        results.insert(Wait(event.Get(), 1));
        SleepMilliseconds(1);
    }
    EXPECT_THAT(results, ElementsAre(WaitResult::Signalled, WaitResult::TimedOut));
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
    EXPECT_THAT(report, HasSubstr("(made the clock) waits for a mutex owned by thread "));
    other.Join();
    EXPECT_EQ(ofOther, WaitResult::Failed);
}

TEST(VirtualTimeDeathTest, DeadlockWithoutHandlerAborts) {
    const auto wait = [] {
        VirtualClock clock(1);
        Wait(MakeAutoResetEvent(), Infinite);
    };
    EXPECT_DEATH(wait(), "waits for an event");
}

TEST(VirtualTimeDeathTest, StrangerMayNotWait) {
    const auto wait = [] {
        VirtualClock clock(1);
        std::thread([] { SleepMilliseconds(1); }).join();
    };
    EXPECT_DEATH(wait(), "must be started by StartThread");
}

TEST(VirtualTime, EndWaitsForThreadsAndDropsEvents) {
    bool ended = false;
    bool called = false;
    const auto counted = std::make_shared<int>();
    {
        VirtualClock clock(1);
        EXPECT_TRUE(Close(StartThread(
            [](void* flag) {
                SleepMilliseconds(1000);
                *static_cast<bool*>(flag) = true;
                return std::uint32_t{0};
            },
            &ended)));
        ClockScheduler().CallAt(ClockScheduler().Now() + 2'000'000, [&called, counted] { called = true; });
    }
    EXPECT_TRUE(ended);
    EXPECT_FALSE(called);
    EXPECT_EQ(counted.use_count(), 1);
}

}  // namespace
}  // namespace Varnholt::Platform
