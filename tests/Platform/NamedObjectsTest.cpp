#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <deque>
#include <fstream>
#include <string>

#include "NamedObjectsHelpers.h"
#include "Platform/Time.h"
#include "Support/ResourceCount.h"
#include "TestThread.h"
#include "UniqueName.h"

namespace Varnholt::Platform {
namespace {

using TestSupport::HelperProcess;
using TestSupport::ResourceCount;

/// A mutex and what a helper process and the test tell each other about it.
struct Stage {
    explicit Stage(const std::string& stageName)
        : mutex(MakeMutex(stageName)),
          ready(MakeSemaphore(0, 100, stageName + ".ready")),
          go(MakeSemaphore(0, 100, stageName + ".go")) {}

    void AwaitReady() const { EXPECT_EQ(Wait(ready.Get(), LongTimeout), WaitResult::Signalled); }
    void SayGo() const { EXPECT_TRUE(ReleaseSemaphore(go.Get(), 1)); }

    const OwnedHandle mutex;
    const OwnedHandle ready;
    const OwnedHandle go;
};

bool Acquire(const Stage& stage) {
    return Wait(stage.mutex.Get(), LongTimeout) == WaitResult::Signalled;
}

/// Owns the mutex twice, and releases it in two steps.
int HoldTwice(const std::vector<std::string>& arguments) {
    const Stage stage(arguments[0]);
    bool isGood = Acquire(stage) && Acquire(stage);
    for (int i = 0; i < 2; ++i) {
        ReleaseSemaphore(stage.ready.Get(), 1);
        isGood = Wait(stage.go.Get(), LongTimeout) == WaitResult::Signalled && isGood;
        isGood = ReleaseMutex(stage.mutex.Get()) && isGood;
    }
    ReleaseSemaphore(stage.ready.Get(), 1);
    return isGood ? 0 : 1;
}

/// Owns the mutex until it is killed, or ends without a release if it is told to go.
int HoldForGood(const std::vector<std::string>& arguments) {
    const Stage stage(arguments[0]);
    const bool isGood = Acquire(stage);
    ReleaseSemaphore(stage.ready.Get(), 1);
    Wait(stage.go.Get(), LongTimeout);
    std::_Exit(isGood ? 0 : 1);
}

void Increment(const std::string& path) {
    int count = 0;
    std::ifstream(path) >> count;
    std::ofstream(path) << count + 1;
}

/// Makes, takes, releases and closes the mutex over and over; adds to a count in a file while it has it.
int Count(const std::vector<std::string>& arguments) {
    for (int i = 0; i < std::stoi(arguments[2]); ++i) {
        const OwnedHandle mutex(MakeMutex(arguments[0]));
        if (Wait(mutex.Get(), LongTimeout) != WaitResult::Signalled) {
            return 1;
        }
        Increment(arguments[1]);
        if (!ReleaseMutex(mutex.Get())) {
            return 2;
        }
    }
    return 0;
}

std::string NameOfThisTest() {
    return UniqueName(testing::UnitTest::GetInstance()->current_test_info()->name());
}

TEST(NamedMutexes, ExcludeOtherProcessesUntilTheLastRelease) {
    const Stage stage(NameOfThisTest());
    HelperProcess helper("HoldTwice", {NameOfThisTest()});
    stage.AwaitReady();
    EXPECT_EQ(Wait(stage.mutex.Get(), 0), WaitResult::TimedOut);
    EXPECT_EQ(Wait(stage.mutex.Get(), 30), WaitResult::TimedOut);
    EXPECT_FALSE(ReleaseMutex(stage.mutex.Get()));
    stage.SayGo();
    stage.AwaitReady();
    EXPECT_EQ(Wait(stage.mutex.Get(), 30), WaitResult::TimedOut);
    stage.SayGo();
    const OwnedHandle event(MakeAutoResetEvent());
    const WaitAnyResult outcome = WaitAny(std::array{event.Get(), stage.mutex.Get()}, LongTimeout);
    EXPECT_EQ(outcome.result, WaitResult::Signalled);
    EXPECT_EQ(outcome.index, 1u);
    EXPECT_EQ(helper.WaitForExit(), 0);
    EXPECT_TRUE(ReleaseMutex(stage.mutex.Get()));
}

TEST(NamedMutexes, OfAProcessThatDiedAreAbandoned) {
    for (const bool isKilled : {true, false}) {
        const Stage stage(NameOfThisTest());
        HelperProcess helper("HoldForGood", {NameOfThisTest()});
        stage.AwaitReady();
        WaitResult result{};
        TestThread waiting([&] {
            result = Wait(stage.mutex.Get(), LongTimeout);
            ReleaseMutex(stage.mutex.Get());
        });
        SleepMilliseconds(20);
        if (isKilled) {
            helper.Kill();
        } else {
            stage.SayGo();
            EXPECT_EQ(helper.WaitForExit(), 0);
        }
        waiting.Join();
        EXPECT_EQ(result, WaitResult::Abandoned);
        EXPECT_EQ(Wait(stage.mutex.Get(), 0), WaitResult::Signalled);
        EXPECT_TRUE(ReleaseMutex(stage.mutex.Get()));
    }
}

/// Several processes make, take and close one mutex all the time: none may end up with a mutex of its own.
TEST(NamedMutexes, AreOneHoweverTheyComeAndGo) {
    constexpr int Processes = 4;
    constexpr int Rounds = 150;
    const std::string path = testing::TempDir() + NameOfThisTest() + ".count";
    std::ofstream(path) << 0;
    {
        std::deque<HelperProcess> helpers;
        for (int i = 0; i < Processes; ++i) {
            helpers.emplace_back("Count", std::vector{NameOfThisTest(), path, std::to_string(Rounds)});
        }
        EXPECT_EQ(Count({NameOfThisTest(), path, std::to_string(Rounds)}), 0);
        for (HelperProcess& helper : helpers) {
            EXPECT_EQ(helper.WaitForExit(), 0);
        }
    }
    int count = 0;
    std::ifstream(path) >> count;
    std::remove(path.c_str());
    EXPECT_EQ(count, (Processes + 1) * Rounds);
}

TEST(NamedObjects, MayHaveLongNamesThatDifferAtTheirEndOnly) {
    const std::string start(220, 'x');
    const OwnedHandle first(MakeMutex(start + "1"));
    const OwnedHandle second(MakeMutex(start + "2"));
    ASSERT_TRUE(first);
    ASSERT_TRUE(second);
    EXPECT_EQ(Wait(first.Get(), 0), WaitResult::Signalled);
    TestThread([&] {
        EXPECT_EQ(Wait(second.Get(), 0), WaitResult::Signalled);
        EXPECT_TRUE(ReleaseMutex(second.Get()));
        const OwnedHandle again(MakeMutex(start + "1"));
        EXPECT_EQ(Wait(again.Get(), 0), WaitResult::TimedOut);
    }).Join();
    EXPECT_TRUE(ReleaseMutex(first.Get()));
}

TEST(NamedObjects, LeaveNothingBehind) {
    const auto use = [] {
        const OwnedHandle mutex(MakeMutex(NameOfThisTest()));
        const OwnedHandle again(MakeMutex(NameOfThisTest()));
        const OwnedHandle semaphore(MakeSemaphore(0, 1, NameOfThisTest() + ".semaphore"));
        // Whoever owns a mutex when its last handle goes does not keep it.
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
    };
    TestThread(use).Join();  // a sanitizer starts a thread of its own with the first
    const ResourceCount before = ResourceCount::TakeSettled();
    for (int i = 0; i < 20; ++i) {
        use();
    }
    TestThread(use).Join();
    EXPECT_TRUE(before.Settles()) << before << " before, " << ResourceCount::Take() << " after";
}

}  // namespace

std::vector<TestSupport::Helper> NamedObjectsHelpers() {
    return {{"HoldTwice", HoldTwice}, {"HoldForGood", HoldForGood}, {"Count", Count}};
}

}  // namespace Varnholt::Platform
