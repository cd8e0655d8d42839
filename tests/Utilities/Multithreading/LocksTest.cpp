#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <limits>
#include <thread>

#include "Platform/CallFilter.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

using Exceptions::InvalidArgumentException;
using Tests::ExpectThrow;

/// Runs `body` on another thread and waits for its end.
template <class Body>
auto Elsewhere(Body body) {
    return std::async(std::launch::async, body).get();
}

/// Whether another thread can have the lock at once; it gives it back.
bool IsFree(SynchronizationObject& lock) {
    return Elsewhere([&] {
        const bool acquired = lock.TryLock(0);
        if (acquired) {
            lock.Unlock();
        }
        return acquired;
    });
}

std::string UniqueName() {
    static int count = 0;
    return "ostra-locks-test-" + std::to_string(std::chrono::steady_clock::now().time_since_epoch().count()) +
           "-" + std::to_string(++count);
}

class Locks : public testing::Test {
  protected:
    ~Locks() override { Platform::InstallCallFilter({}); }

    static void MakeFail(const std::string& name) {
        Platform::InstallCallFilter([name](std::string_view call) {
            return call == name ? Platform::Errors::AccessDenied : Platform::Errors::Success;
        });
    }
};

TEST_F(Locks, AMutexOfOneNameIsRecursiveAndOneLock) {
    const std::string name = UniqueName();
    auto original = std::make_unique<SynchronizationObject>(CreateMutexImpl(name));
    SynchronizationObject copy(*original);
    Mutex sameName(name), otherName(UniqueName());
    original->Lock();
    copy.Lock();
    for (const bool isFree : {false, true}) {
        original.reset();  // the lock lives with the last of them
        copy.Unlock();
        EXPECT_EQ(IsFree(copy), isFree) << "as many unlocks as locks";
        EXPECT_EQ(IsFree(sameName), isFree);
        EXPECT_TRUE(IsFree(otherName));
    }
}

TEST_F(Locks, ANamelessMutexIsItsOwnAndHasNoTimeouts) {
    Mutex mutex(""), other("");
    std::atomic<bool> acquired = false;
    std::thread waiting;
    {
        const ScopedLock lock(mutex), again(mutex);
        Elsewhere([&] { const ScopedLock lockOther(other); });
        waiting = std::thread([&] {
            const ScopedLock held(mutex);
            acquired = true;
        });
        std::this_thread::sleep_for(std::chrono::milliseconds(30));
        EXPECT_FALSE(acquired);
    }
    waiting.join();
    for (const int timeout : {0, 10, -1}) {
        ExpectThrow<std::runtime_error>(
            "CriticalSection::TryLock: not yet implemented (TryEnterCriitcalSection not exists on  Win9X)",
            [&] { mutex.TryLock(timeout); });
    }
    Elsewhere([&] { const ScopedLock lock(mutex); });  // the refusal has not locked
}

TEST_F(Locks, TimeoutIsALimitAndNegativeIsNone) {
    Mutex mutex(UniqueName());
    for (const int timeout : {-1, std::numeric_limits<int>::min()}) {
        std::promise<void> held;
        std::atomic<bool> released = false;
        std::thread owner([&] {
            mutex.Lock();
            held.set_value();
            std::this_thread::sleep_for(std::chrono::milliseconds(30));
            released = true;
            mutex.Unlock();
        });
        held.get_future().wait();
        EXPECT_FALSE(mutex.TryLock(1));
        EXPECT_TRUE(mutex.TryLock(timeout));
        EXPECT_TRUE(released);
        mutex.Unlock();
        owner.join();
    }
}

TEST_F(Locks, ASemaphoreStartsAtOneAndEachUnlockGivesOneBackUpToTheMaximum) {
    const std::string name = UniqueName();
    const auto takeAll = [](SynchronizationObject& semaphore) {
        int taken = 0;
        for (; semaphore.TryLock(0); ++taken) {
        }
        return taken;
    };
    for (const std::string& each : {std::string(), name}) {
        SynchronizationObject semaphore(CreateSemaphoreImpl(each, 3));
        for (const int unlocks : {1, 2, 5}) {
            EXPECT_EQ(takeAll(semaphore), std::min(unlocks, 3));
            for (int i = 0; i < (unlocks == 1 ? 2 : 5); ++i) {
                Elsewhere([&] { semaphore.Unlock(); });
            }
        }
    }
    SynchronizationObject semaphore(CreateSemaphoreImpl(name, 1)), sameName(CreateSemaphoreImpl(name, 1));
    semaphore.Lock();
    EXPECT_FALSE(sameName.TryLock(0));
}

TEST_F(Locks, FailuresAreInvalidArguments) {
    MakeFail("MakeSemaphore");
    ExpectThrow<InvalidArgumentException>("handle is NULL", [] { CreateSemaphoreImpl("", 1); });
    MakeFail("MakeMutex");
    ExpectThrow<InvalidArgumentException>("handle is NULL", [] { const Mutex refused(UniqueName()); });
    Platform::InstallCallFilter({});

    Mutex mutex(UniqueName());
    MakeFail("Wait");
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex.TryLock(0); });
    Platform::InstallCallFilter({});
    std::thread([&] { mutex.Lock(); }).join();  // abandons it
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex.TryLock(1000); });
    EXPECT_TRUE(IsFree(mutex)) << "whoever was told of a failure does not hold the mutex";
    std::thread([&] { mutex.Lock(); }).join();
    mutex.Lock();  // does not look at the outcome: acquired all the same
    EXPECT_FALSE(IsFree(mutex));
    mutex.Unlock();
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
