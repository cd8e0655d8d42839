#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <thread>

#include "Platform/CallFilter.h"
#include "Support/ExpectThrow.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Multithreading/Mutex.h"
#include "Utilities/Multithreading/ScopedLock.h"

namespace Varnholt::Utilities::Multithreading {
namespace {

using namespace std::chrono_literals;
using Exceptions::InvalidArgumentException;
using testing::StartsWith;
using Tests::ExpectThrow;

constexpr auto ALittle = 30ms;

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

TEST_F(Locks, MutexIsRecursiveAndNeedsAsManyUnlocks) {
    for (const std::string& name : {std::string(), UniqueName()}) {
        SCOPED_TRACE(name);
        Mutex mutex(name);
        mutex.Lock();
        mutex.Lock();
        std::atomic<bool> acquired = false;
        std::thread other([&] {
            const ScopedLock lock(mutex);
            acquired = true;
        });
        std::this_thread::sleep_for(ALittle);
        EXPECT_FALSE(acquired);
        mutex.Unlock();
        std::this_thread::sleep_for(ALittle);
        EXPECT_FALSE(acquired) << "one of two unlocks must not be enough";
        mutex.Unlock();
        other.join();
        EXPECT_TRUE(acquired);
    }
}

TEST_F(Locks, SameNameIsOneLockAndSoIsACopy) {
    const std::string name = UniqueName();
    Mutex mutex(name), sameName(name), otherName(UniqueName());
    Mutex nameless(""), otherNameless("");
    const ScopedLock lock(mutex), lockNameless(nameless);
    EXPECT_FALSE(IsFree(sameName));
    EXPECT_TRUE(IsFree(otherName));
    Elsewhere([&] { const ScopedLock lockOther(otherNameless); });

    auto original = std::make_unique<SynchronizationObject>(CreateMutexImpl(UniqueName()));
    SynchronizationObject copy(*original);
    original->Lock();
    EXPECT_FALSE(IsFree(copy));
    original.reset();  // the lock lives with the last of them
    copy.Unlock();
    EXPECT_TRUE(IsFree(copy));
}

TEST_F(Locks, TimeoutIsALimitAndNegativeIsNone) {
    Mutex mutex(UniqueName());
    for (const int timeout : {-1, -5, std::numeric_limits<int>::min()}) {
        std::promise<void> held;
        std::atomic<bool> released = false;
        std::thread owner([&] {
            mutex.Lock();
            held.set_value();
            std::this_thread::sleep_for(ALittle);
            released = true;
            mutex.Unlock();
        });
        held.get_future().wait();
        EXPECT_FALSE(mutex.TryLock(0));
        EXPECT_FALSE(mutex.TryLock(1));
        EXPECT_TRUE(mutex.TryLock(timeout));
        EXPECT_TRUE(released);
        mutex.Unlock();
        owner.join();
    }
}

TEST_F(Locks, NamelessMutexHasNoTimeouts) {
    Mutex mutex("");
    for (const int timeout : {0, 10, -1}) {
        ExpectThrow<std::runtime_error>(
            "CriticalSection::TryLock: not yet implemented (TryEnterCriitcalSection not exists on  Win9X)",
            [&] { mutex.TryLock(timeout); });
    }
    Elsewhere([&] { const ScopedLock lock(mutex); });  // the refusal has not locked
}

TEST_F(Locks, SemaphoreStartsAtOneAndStopsAtItsMaximum) {
    for (const std::string& name : {std::string(), UniqueName()}) {
        SynchronizationObject semaphore(CreateSemaphoreImpl(name, 3));
        semaphore.Lock();
        EXPECT_FALSE(semaphore.TryLock(0));
        EXPECT_FALSE(semaphore.TryLock(1));
        Elsewhere([&] { semaphore.Unlock(); });
        EXPECT_TRUE(semaphore.TryLock(0)) << "not bound to a thread";
        for (int i = 0; i < 5; ++i) {
            semaphore.Unlock();
        }
        for (int i = 0; i < 3; ++i) {
            EXPECT_TRUE(semaphore.TryLock(0)) << i;
        }
        EXPECT_FALSE(semaphore.TryLock(0));
    }
    const std::string name = UniqueName();
    SynchronizationObject semaphore(CreateSemaphoreImpl(name, 1)), sameName(CreateSemaphoreImpl(name, 1));
    semaphore.Lock();
    EXPECT_FALSE(sameName.TryLock(0));
}

TEST_F(Locks, ObjectsThatCannotBeMadeAreRefusedWithTheirPlace) {
    MakeFail("MakeSemaphore");
    ExpectThrow<InvalidArgumentException>("handle is NULL", [] { CreateSemaphoreImpl("", 1); });
    MakeFail("MakeMutex");
    try {
        const Mutex refused(UniqueName());
        FAIL();
    } catch (const InvalidArgumentException& exception) {
        EXPECT_STREQ(exception.what(), "handle is NULL");
        EXPECT_THAT(exception.GetTrace().front(),
                    StartsWith("::Varnholt::Utilities::Multithreading::Win32Lockable<Varnholt::Utilities::"
                               "Multithreading::SynchronizationObject::Impl>::Win32Lockable(): "
                               "\\src\\Utilities/Multithreading/win32/LockableImpl"));
    }
}

TEST_F(Locks, WaitThatFailsIsAnInvalidMutex) {
    Mutex mutex(UniqueName());
    MakeFail("Wait");
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex.TryLock(0); });
}

TEST_F(Locks, AbandonedMutexIsReportedOnceAndThenFree) {
    Mutex mutex(UniqueName());
    std::thread([&] { mutex.Lock(); }).join();
    ExpectThrow<InvalidArgumentException>("invalid mutex", [&] { mutex.TryLock(1000); });
    EXPECT_TRUE(IsFree(mutex)) << "whoever was told of a failure does not hold the mutex";

    std::thread([&] { mutex.Lock(); }).join();
    mutex.Lock();  // does not look at the outcome: acquired all the same
    EXPECT_FALSE(IsFree(mutex));
    mutex.Unlock();
}

TEST_F(Locks, ScopedLockUnlocksWhenItsBlockThrows) {
    Mutex mutex(UniqueName());
    EXPECT_THROW(
        {
            const ScopedLock lock(mutex);
            throw 1;
        },
        int);
    EXPECT_TRUE(IsFree(mutex));
}

}  // namespace
}  // namespace Varnholt::Utilities::Multithreading
