// Mutexes, semaphores and conditions.
#include <limits>

#include "Platform/UniqueName.h"
#include "Support/DriverTest.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Multithreading/Condition.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

using namespace Exceptions;
using Platform::SleepMilliseconds;
using namespace Tests;

void Elsewhere(std::function<void()> work) {
    BackgroundThread(std::move(work)).Join();
}

/// Whether another thread can have the lock, at once or so soon; it gives it back.
bool IsFree(SynchronizationObject& lock, int milliseconds = 0) {
    bool acquired = false;
    Elsewhere([&] {
        acquired = lock.TryLock(milliseconds);
        if (acquired) {
            lock.Unlock();
        }
    });
    return acquired;
}

class Locks : public testing::Test {
  protected:
    ~Locks() override { Platform::InstallCallFilter({}); }

    /// Makes a call fail, on this thread only when others are in the middle of theirs.
    static void MakeFail(const std::string& name) {
        Platform::InstallCallFilter([name, failing = std::this_thread::get_id()](std::string_view call) {
            return call == name && std::this_thread::get_id() == failing ? Platform::Errors::InvalidHandle
                                                                         : Platform::Errors::Success;
        });
    }

    const Tests::TestClock clock_{Tests::TestTime::RealForThreadSanitizer};
    Mutex mutex_{Platform::UniqueName("lock")};
};

TEST_F(Locks, ANamelessMutexIsItsOwnAndHasNoTimeouts) {
    Mutex mutex(""), other("");
    auto hold = std::make_unique<ScopedLock>(mutex);
    mutex.Lock();
    mutex.Unlock();
    Elsewhere([&] { const ScopedLock lockOther(other); });
    BackgroundThread waiting([&] { const ScopedLock held(mutex); });
    SleepMilliseconds(30);
    EXPECT_FALSE(waiting.HasEnded());
    hold.reset();
    waiting.Join();
    ExpectThrow<std::runtime_error>(
        "CriticalSection::TryLock: not yet implemented (TryEnterCriitcalSection not exists on  Win9X)",
        [&] { mutex.TryLock(0); });
    Elsewhere([&] { const ScopedLock lock(mutex); });  // the refusal has not locked
}

TEST_F(Locks, TimeoutIsALimitAndNegativeIsNone) {
    for (const int timeout : {-1, std::numeric_limits<int>::min()}) {
        BackgroundThread owner([&] {
            mutex_.Lock();
            SleepMilliseconds(30);
            mutex_.Unlock();
        });
        WaitUntil([&] { return !IsFree(mutex_); });
        EXPECT_FALSE(mutex_.TryLock(1));
        EXPECT_TRUE(mutex_.TryLock(timeout));
        mutex_.Unlock();
    }
}

TEST_F(Locks, ASemaphoreStartsAtOneAndEachUnlockGivesOneBackUpToTheMaximum) {
    const std::string name = Platform::UniqueName("semaphore");
    SynchronizationObject semaphore(CreateSemaphoreImpl(name, 3)), sameName(CreateSemaphoreImpl(name, 3));
    for (const int unlocks : {1, 2, 5}) {
        int taken = 0;
        for (; sameName.TryLock(0); ++taken) {
        }
        EXPECT_EQ(taken, std::min(unlocks, 3));
        for (int i = 0; i < (unlocks == 1 ? 2 : 5); ++i) {
            Elsewhere([&] { semaphore.Unlock(); });
        }
    }
}

TEST_F(Locks, FailuresAreInvalidArguments) {
    MakeFail("MakeSemaphore");
    ExpectThrow<InvalidArgumentException>("handle is NULL", [] { CreateSemaphoreImpl("", 1); });
    MakeFail("Wait");
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex_.TryLock(0); });
    Platform::InstallCallFilter({});
    Elsewhere([&] { mutex_.Lock(); });  // abandons it
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex_.TryLock(1000); });
    EXPECT_TRUE(IsFree(mutex_)) << "whoever was told of a failure does not hold the mutex";
    Elsewhere([&] { mutex_.Lock(); });
    mutex_.Lock();  // does not look at the outcome: acquired all the same
    EXPECT_FALSE(IsFree(mutex_));
    mutex_.Unlock();
}

/// A condition with some threads that wait for it.
class ConditionTest : public Locks {
  protected:
    ~ConditionTest() override {
        Platform::InstallCallFilter({});
        condition_.broadcast();  // lets go whom a failed test has left
        threads_.clear();
    }

    /// Returns once all of them are in `Wait`: they hold the mutex until they are counted there.
    void StartWaiters(int count) {
        for (int i = 0; i < count; ++i) {
            threads_.push_back(std::make_unique<BackgroundThread>([this] {
                const ScopedLock lock(mutex_);
                ++waiting_;
                try {
                    EXPECT_TRUE(condition_.Wait(0));
                } catch (const ResourceException& exception) {
                    failure_ = exception.what();
                    EXPECT_TRUE(IsFree(mutex_, 1000)) << "a wait that has failed holds nothing";
                    mutex_.Lock();  // the scope's unlock finds nothing to unlock otherwise
                }
                --waiting_;
                ++woken_;
            }));
        }
        Await(waiting_, count);
    }
    void Await(const int& counter, int value) {
        WaitUntil([&] {
            const ScopedLock lock(mutex_);
            return counter == value;
        });
    }
    /// So many wake up, and no more a little later.
    void ExpectWoken(int count) {
        Await(woken_, count);
        SleepMilliseconds(30);
        const ScopedLock lock(mutex_);
        EXPECT_EQ(woken_, count);
    }

    Condition condition_{mutex_};
    // Guarded by the mutex.
    int waiting_ = 0;
    int woken_ = 0;
    std::string failure_;

  private:
    std::vector<std::unique_ptr<BackgroundThread>> threads_;
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
        Await(woken_, 3 * round);
    }
    StartWaiters(2);
    ExpectWoken(6);  // no wake-up is left over
    condition_.signal();
    ExpectWoken(7);  // nor did the signal pass for a broadcast
    condition_.broadcast();
    ExpectWoken(8);
}

TEST_F(ConditionTest, NeedsItsObjectsAndAMutexWithAName) {
    for (const char* call : {"MakeSemaphore", "MakeAutoResetEvent"}) {
        MakeFail(call);
        ExpectThrow<ResourceException>("ConditionImpl::ConditionImpl() can't create!",
                                       [&] { const Condition refused(mutex_); });
    }
    Platform::InstallCallFilter({});
    Mutex nameless("");
    Condition refused(nameless);
    const ScopedLock lock(nameless);
    ExpectThrow<ResourceException>("Condition::Wait() invalid Mutex! (must be a real mutex)",
                                   [&] { refused.Wait(0); });
    refused.broadcast();  // would wait for ever for a waiter that is still counted
}

TEST_F(ConditionTest, AFailedWakeUnlocksTheMutexAndKeepsNothingLocked) {
    const std::vector<std::tuple<const char*, void (Condition::*)(), const char*, int>> cases{
        {"ReleaseSemaphore", &Condition::signal, "Condition::signal() invalid condition!", 0},
        {"ReleaseSemaphore", &Condition::broadcast, "Condition::broadcast() unable to release semaphore!", 0},
        {"Wait", &Condition::broadcast, "Condition::broadcast() invalid event!", 2},
    };
    StartWaiters(2);
    for (const auto& [failing, wake, message, woken] : cases) {
        mutex_.Lock();
        MakeFail(failing);
        ExpectThrow<ResourceException>(message, [&, wake = wake] { (condition_.*wake)(); });
        Platform::InstallCallFilter({});
        EXPECT_TRUE(IsFree(mutex_, 1000)) << "must have been unlocked";
        ExpectWoken(woken);
    }
    StartWaiters(1);
    Elsewhere([this] { condition_.signal(); });  // another thread gets into the state's own lock
    ExpectWoken(3);
}

TEST_F(ConditionTest, WaiterThatCannotTakeTheMutexAgainSaysSo) {
    const auto onceAtTheWaiter = [](std::string_view name, std::function<Platform::ErrorCode()> action) {
        Platform::InstallCallFilter(
            [=, done = false, waker = std::this_thread::get_id()](std::string_view call) mutable {
                const bool isMeant = call == name && std::this_thread::get_id() != waker;
                return isMeant && !std::exchange(done, true) ? action() : Platform::Errors::Success;
            });
    };
    // The call fails, or else finds a mutex whose owner has ended.
    const std::vector<std::tuple<const char*, void (Condition::*)(), const char*, bool>> cases{
        {"woken alone", &Condition::signal, "Wait", true},
        {"last of a broadcast", &Condition::broadcast, "SignalAndWait", true},
        {"last, abandoned mutex", &Condition::broadcast, "SignalAndWait", false}};
    for (const auto& [name, wake, call, fails] : cases) {
        SCOPED_TRACE(name);
        StartWaiters(1);
        onceAtTheWaiter(call, [this, fails = fails] {
            if (!fails) {
                Elsewhere([this] { mutex_.Lock(); });
            }
            return fails ? Platform::Errors::InvalidHandle : Platform::Errors::Success;
        });
        (condition_.*wake)();
        Await(waiting_, 0);
        EXPECT_EQ(std::exchange(failure_, ""), "Condition::Wait() invalid mutex! (must be a real mutex)");
    }
    bool hasLeft = false;
    StartWaiters(1);
    onceAtTheWaiter("SignalAndWait", [&] {
        SleepMilliseconds(30);
        hasLeft = true;
        return Platform::Errors::Success;
    });
    condition_.broadcast();
    EXPECT_TRUE(hasLeft) << "what the failures left behind passed for the end of this broadcast";
}

/// One that was counted and then cannot wait: a broadcast that has begun by then must not wait for it.
TEST_F(ConditionTest, ABroadcastEndsWithAWaiterThatCannotWait) {
    Platform::InstallCallFilter([](std::string_view call) {
        if (call != "SignalAndWait") {
            return Platform::Errors::Success;
        }
        SleepMilliseconds(50);
        return Platform::Errors::InvalidHandle;
    });
    BackgroundThread waiter([this] {
        mutex_.Lock();
        ExpectThrow<ResourceException>("Condition::Wait() invalid Mutex! (must be a real mutex)",
                                       [this] { condition_.Wait(0); });
    });
    SleepMilliseconds(10);
    condition_.broadcast();
    waiter.Join();
    EXPECT_TRUE(mutex_.TryLock(0)) << "a wait that has failed holds nothing";
    mutex_.Unlock();
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
