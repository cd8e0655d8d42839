#include <array>
#include <chrono>
#include <cstdio>
#include <deque>
#include <fstream>

#include "ForkedProcess.h"
#include "Platform/Linux/SharedContent.h"
#include "TestThread.h"
#include "UniqueName.h"

namespace Varnholt::Platform {
namespace {

std::string NameOfThisTest() {
    return UniqueName(testing::UnitTest::GetInstance()->current_test_info()->name());
}

/// A mutex and what another process and the test tell each other about it.
struct Stage {
    bool Acquire() const { return Wait(mutex.Get(), LongTimeout) == WaitResult::Signalled; }

    const OwnedHandle mutex{MakeMutex(NameOfThisTest())};
    const OwnedHandle ready{MakeSemaphore(0, 100, NameOfThisTest() + ".ready")};
    const OwnedHandle go{MakeSemaphore(0, 100, NameOfThisTest() + ".go")};
};

TEST(NamedMutexes, OfAProcessThatDiedOrClosedThemAreAbandoned) {
    for (const bool isKilled : {true, false}) {
        ForkedProcess holder([] {
            {
                const Stage stage;
                stage.Acquire();
                ReleaseSemaphore(stage.ready.Get(), 1);
                Wait(stage.go.Get(), LongTimeout);
            }
            return pause();  // lives on without a handle
        });
        const Stage stage;
        const OwnedHandle event(MakeAutoResetEvent());
        EXPECT_EQ(Wait(stage.ready.Get(), LongTimeout), WaitResult::Signalled);
        EXPECT_EQ(Wait(stage.mutex.Get(), 30), WaitResult::TimedOut);
        WaitResult result{};
        TestThread waiting([&] {
            result = isKilled ? Wait(stage.mutex.Get(), LongTimeout)
                              : WaitAny(std::array{event.Get(), stage.mutex.Get()}, LongTimeout).result;
            ReleaseMutex(stage.mutex.Get());
        });
        SleepMilliseconds(20);
        if (isKilled) {
            holder.Kill();
        } else {
            ReleaseSemaphore(stage.go.Get(), 1);
        }
        waiting.Join();
        EXPECT_EQ(result, WaitResult::Abandoned);
        EXPECT_TRUE(stage.Acquire());
        EXPECT_TRUE(ReleaseMutex(stage.mutex.Get()));
    }
}

/// Whoever sleeps meanwhile is woken at once: that is not left to the next look, which comes 50 ms later.
TEST(NamedObjects, WakeThoseWhoAwaitTheirChange) {
    Linux::ChangeCount changes;
    const auto begin = std::chrono::steady_clock::now();
    changes.Await(0, 1'050'000);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::microseconds(1'050'000));
    TestThread sleeper([&] { changes.Await(0, 3'600'000'000); });
    SleepMilliseconds(50);
    changes.Increment();
    sleeper.Join();
}

/// Several processes make, take and close one mutex all the time: none may end up with a mutex of its own.
TEST(NamedMutexes, AreOneHoweverTheyComeAndGo) {
    constexpr int Processes = 4, Rounds = 150;
    const std::string path = testing::TempDir() + NameOfThisTest() + ".count";
    std::ofstream(path) << 0;
    const auto increase = [&path] {
        for (int i = 0; i < Rounds; ++i) {
            const OwnedHandle mutex(MakeMutex(NameOfThisTest()));
            if (Wait(mutex.Get(), LongTimeout) != WaitResult::Signalled) {
                return 1;
            }
            int count = 0;
            std::ifstream(path) >> count;
            std::ofstream(path) << count + 1;
            ReleaseMutex(mutex.Get());
        }
        return 0;
    };
    std::deque<ForkedProcess> others;
    for (int i = 0; i < Processes; ++i) {
        others.emplace_back(increase);
    }
    EXPECT_EQ(increase(), 0);
    for (ForkedProcess& other : others) {
        EXPECT_EQ(other.WaitForExit(), 0);
    }
    int count = 0;
    std::ifstream(path) >> count;
    std::remove(path.c_str());
    EXPECT_EQ(count, (Processes + 1) * Rounds);
}

}  // namespace
}  // namespace Varnholt::Platform
