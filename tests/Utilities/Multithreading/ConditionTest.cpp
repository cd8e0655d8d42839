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
        condition_.broadcast();  // lets go whom a failed test has left
        for (std::thread& thread : threads_) {
            thread.join();
        }
    }

    /// Returns once all of them are in `Wait`: they hold the mutex until they are counted there.
    void StartWaiters(int count) {
        for (int i = 0; i < count; ++i) {
            threads_.emplace_back([this] {
                const ScopedLock lock(mutex_);
                ++waiting_;
                try {
                    EXPECT_TRUE(condition_.Wait(0));
                } catch (const ResourceException& exception) {
                    failure_ = exception.what();
                    std::thread([this] {
                        EXPECT_TRUE(mutex_.TryLock(1000)) << "a wait that has failed holds nothing";
                        mutex_.Unlock();
                    }).join();
                    mutex_.Lock();  // the scope's unlock finds nothing to unlock otherwise
                }
                --waiting_;
                ++woken_;
            });
        }
        Await([this, count] { return waiting_ == count; });
    }

    template <class State>
    bool Await(State state) {
        for (int i = 0; i < 5000; ++i) {
            {
                const ScopedLock lock(mutex_);
                if (state()) {
                    return true;
                }
            }
            std::this_thread::sleep_for(1ms);
        }
        ADD_FAILURE() << "waited in vain: " << waiting_ << " waiting, " << woken_ << " woken";
        return false;
    }

    /// So many wake up, and no more a little later.
    void ExpectWoken(int count) {
        Await([this, count] { return woken_ == count; });
        std::this_thread::sleep_for(ALittle);
        const ScopedLock lock(mutex_);
        EXPECT_EQ(woken_, count);
    }

    /// Makes a call fail, on this thread only when others are in the middle of theirs.
    static void MakeFail(const std::string& name) {
        Platform::InstallCallFilter([name, failing = std::this_thread::get_id()](std::string_view call) {
            return call == name && std::this_thread::get_id() == failing ? Platform::Errors::InvalidHandle
                                                                         : Platform::Errors::Success;
        });
    }

    Mutex mutex_{UniqueName()};
    Condition condition_{mutex_};
    // Guarded by `mutex`.
    int waiting_ = 0;
    int woken_ = 0;
    std::string failure_;

  private:
    std::vector<std::thread> threads_;
};

TEST_F(ConditionTest, SignalWakesOneAndIsForgottenWithoutAWaiter) {
    condition_.signal();
    condition_.broadcast();
    StartWaiters(3);
    ExpectWoken(0);
    for (int expected = 1; expected <= 3; ++expected) {
        condition_.signal();
        ExpectWoken(expected);
    }
}

TEST_F(ConditionTest, BroadcastReturnsWhenAllHaveLeftAndLeavesNothingBehind) {
    for (int round = 1; round <= 2; ++round) {
        StartWaiters(3);
        {
            const ScopedLock lock(mutex_);
            condition_.broadcast();
            EXPECT_EQ(woken_, 3 * (round - 1)) << "the mutex is still held here";
        }
        Await([&] { return woken_ == 3 * round; });
    }
    StartWaiters(2);
    ExpectWoken(6);  // no wake-up is left over
    condition_.signal();
    ExpectWoken(7);  // nor did the signal pass for a broadcast
    condition_.broadcast();
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
                                       [&] { const Condition refused(mutex_); });
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
        mutex_.Lock();
        MakeFail("ReleaseSemaphore");
        ExpectThrow<ResourceException>(row.message, [&] { (condition_.*row.operation)(); });
        Platform::InstallCallFilter({});
        std::thread([&] {
            EXPECT_TRUE(mutex_.TryLock(1000)) << "must have been unlocked";
            mutex_.Unlock();
        }).join();
    }
    ExpectWoken(0);
    std::thread([this] { condition_.signal(); }).join();  // another thread gets into the state's own lock
    ExpectWoken(1);
    condition_.broadcast();
    ExpectWoken(2);
}

TEST_F(ConditionTest, BroadcastReportsAnEventItCannotWaitFor) {
    StartWaiters(2);
    mutex_.Lock();
    MakeFail("Wait");
    ExpectThrow<ResourceException>("Condition::broadcast() invalid event!", [&] { condition_.broadcast(); });
    Platform::InstallCallFilter({});
    Await([this] { return woken_ == 2; });  // which needs the mutex that the failure has unlocked
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
                std::thread([this] { mutex_.Lock(); }).join();
            }
            return fails ? Platform::Errors::InvalidHandle : Platform::Errors::Success;
        });
        (condition_.*row.wake)();
        Await([this] { return waiting_ == 0; });
        EXPECT_EQ(std::exchange(failure_, ""), "Condition::Wait() invalid mutex! (must be a real mutex)");
    }
    StartWaiters(1);
    std::atomic<bool> hasLeft = false;
    onceAtTheWaiters("SignalAndWait", [&] {
        std::this_thread::sleep_for(ALittle);
        hasLeft = true;
        return Platform::Errors::Success;
    });
    condition_.broadcast();
    EXPECT_TRUE(hasLeft) << "what the failures left behind passed for the end of this broadcast";
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
