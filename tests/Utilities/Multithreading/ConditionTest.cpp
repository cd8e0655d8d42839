#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Platform/CallFilter.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Multithreading/Condition.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

using namespace std::chrono_literals;
using Exceptions::ResourceException;
using Tests::ExpectThrow;

constexpr auto ALittle = 30ms;

std::string UniqueName() {
    return "ostra-condition-test-" +
           std::to_string(std::chrono::steady_clock::now().time_since_epoch().count());
}

/// A condition with some threads that wait for it.
class ConditionTest : public testing::Test {
  protected:
    ~ConditionTest() override {
        Platform::InstallCallFilter({});
        condition.broadcast();  // lets go whom a failed test has left
        for (std::thread& thread : threads) {
            thread.join();
        }
    }

    /// Returns once all of them are in `Wait`: they hold the mutex until they are counted there.
    void StartWaiters(int count) {
        for (int i = 0; i < count; ++i) {
            threads.emplace_back([this] {
                const ScopedLock lock(mutex);
                ++waiting;
                try {
                    condition.Wait(0);
                } catch (const ResourceException& exception) {
                    failure = exception.what();
                    mutex.Lock();  // the scope's unlock finds nothing to unlock otherwise
                }
                --waiting;
                ++woken;
            });
        }
        Await([this, count] { return waiting == count; });
    }

    template <class State>
    bool Await(State state) {
        for (int i = 0; i < 5000; ++i) {
            {
                const ScopedLock lock(mutex);
                if (state()) {
                    return true;
                }
            }
            std::this_thread::sleep_for(1ms);
        }
        ADD_FAILURE() << "waited in vain: " << waiting << " waiting, " << woken << " woken";
        return false;
    }

    /// So many wake up, and no more a little later.
    void ExpectWoken(int count) {
        Await([this, count] { return woken == count; });
        std::this_thread::sleep_for(ALittle);
        const ScopedLock lock(mutex);
        EXPECT_EQ(woken, count);
    }

    /// Makes a call fail, on this thread only when others are in the middle of theirs.
    static void MakeFail(const std::string& name) {
        Platform::InstallCallFilter([name, failing = std::this_thread::get_id()](std::string_view call) {
            return call == name && std::this_thread::get_id() == failing ? Platform::Errors::InvalidHandle
                                                                         : Platform::Errors::Success;
        });
    }

    Mutex mutex{UniqueName()};
    Condition condition{mutex};
    // Guarded by `mutex`.
    int waiting = 0;
    int woken = 0;
    std::string failure;

  private:
    std::vector<std::thread> threads;
};

TEST_F(ConditionTest, SignalWakesOneAndIsForgottenWithoutAWaiter) {
    condition.signal();
    condition.broadcast();
    StartWaiters(3);
    ExpectWoken(0);
    for (int expected = 1; expected <= 3; ++expected) {
        condition.signal();
        ExpectWoken(expected);
    }
}

TEST_F(ConditionTest, BroadcastReturnsWhenAllHaveLeftAndLeavesNothingBehind) {
    for (int round = 1; round <= 2; ++round) {
        StartWaiters(3);
        {
            const ScopedLock lock(mutex);
            condition.broadcast();
            EXPECT_EQ(woken, 3 * (round - 1)) << "the mutex is still held here";
        }
        Await([&] { return woken == 3 * round; });
    }
    StartWaiters(2);
    ExpectWoken(6);  // no wake-up is left over
    condition.signal();
    ExpectWoken(7);  // nor did the signal pass for a broadcast
    condition.broadcast();
    ExpectWoken(8);
}

TEST_F(ConditionTest, NeedsAMutexWithAName) {
    Mutex nameless("");
    Condition refused(nameless);
    const ScopedLock lock(nameless);
    ExpectThrow<ResourceException>("Condition::Wait() invalid Mutex! (must be a real mutex)",
                                   [&] { refused.Wait(0); });
    refused.broadcast();  // would wait for ever for a waiter that is still counted
}

TEST_F(ConditionTest, CannotBeMadeWithoutItsObjects) {
    for (const char* call : {"MakeSemaphore", "MakeAutoResetEvent"}) {
        MakeFail(call);
        SCOPED_TRACE(call);
        ExpectThrow<ResourceException>("ConditionImpl::ConditionImpl() can't create!",
                                       [&] { const Condition refused(mutex); });
    }
}

TEST_F(ConditionTest, FailedReleaseUnlocksTheMutexAndKeepsNothingLocked) {
    struct Case {
        const char* name;
        void (Condition::*operation)();
        const char* message;
    };
    StartWaiters(2);
    for (const Case& row :
         {Case{"signal", &Condition::signal, "Condition::signal() invalid condition!"},
          Case{"broadcast", &Condition::broadcast, "Condition::broadcast() unable to release semaphore!"}}) {
        SCOPED_TRACE(row.name);
        mutex.Lock();
        MakeFail("ReleaseSemaphore");
        ExpectThrow<ResourceException>(row.message, [&] { (condition.*row.operation)(); });
        Platform::InstallCallFilter({});
        std::thread([&] {
            EXPECT_TRUE(mutex.TryLock(1000)) << "must have been unlocked";
            mutex.Unlock();
        }).join();
    }
    ExpectWoken(0);
    std::thread([this] { condition.signal(); }).join();  // another thread gets into the state's own lock
    ExpectWoken(1);
    condition.broadcast();
    ExpectWoken(2);
}

TEST_F(ConditionTest, BroadcastReportsAnEventItCannotWaitFor) {
    StartWaiters(2);
    mutex.Lock();
    MakeFail("Wait");
    ExpectThrow<ResourceException>("Condition::broadcast() invalid event!", [&] { condition.broadcast(); });
    Platform::InstallCallFilter({});
    Await([this] { return woken == 2; });  // which needs the mutex that the failure has unlocked
}

TEST_F(ConditionTest, WaiterThatCannotTakeTheMutexAgainSaysSo) {
    const struct {
        const char* name;
        void (Condition::*wake)();
        const char* call;
        bool fails;  ///< or else finds a mutex whose owner has ended
    } cases[] = {{"woken alone", &Condition::signal, "Wait", true},
                 {"last of a broadcast", &Condition::broadcast, "SignalAndWait", true},
                 {"last, abandoned mutex", &Condition::broadcast, "SignalAndWait", false}};
    const auto onceAtTheWaiters = [](std::string_view name, std::function<Platform::ErrorCode()> action) {
        auto done = std::make_shared<std::atomic<bool>>(false);
        Platform::InstallCallFilter([=, waker = std::this_thread::get_id()](std::string_view call) {
            const bool isMeant = call == name && std::this_thread::get_id() != waker;
            return isMeant && !done->exchange(true) ? action() : Platform::Errors::Success;
        });
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.name);
        StartWaiters(1);
        onceAtTheWaiters(row.call, [this, fails = row.fails] {
            if (!fails) {
                std::thread([this] { mutex.Lock(); }).join();
            }
            return fails ? Platform::Errors::InvalidHandle : Platform::Errors::Success;
        });
        (condition.*row.wake)();
        Await([this] { return waiting == 0; });
        EXPECT_EQ(std::exchange(failure, ""), "Condition::Wait() invalid mutex! (must be a real mutex)");
    }
    StartWaiters(1);
    std::atomic<bool> hasLeft = false;
    onceAtTheWaiters("SignalAndWait", [&] {
        std::this_thread::sleep_for(ALittle);
        hasLeft = true;
        return Platform::Errors::Success;
    });
    condition.broadcast();
    EXPECT_TRUE(hasLeft) << "what the failures left behind passed for the end of this broadcast";
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
