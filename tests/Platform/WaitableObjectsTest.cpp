#include <array>
#include <deque>

#include "EachClock.h"
#include "TestThread.h"
#include "UniqueName.h"

namespace Varnholt::Platform {
namespace {

/// Long enough for threads that said what they do next to have done it, on a busy machine as well.
constexpr std::uint32_t SettlingTime = 200;

/// Returns when that many threads have counted themselves and gone on to what they do next.
void LetSettle(const std::atomic<int>& begun, int threadCount) {
    while (begun < threadCount) {
        SleepMilliseconds(1);
    }
    SleepMilliseconds(SettlingTime);
}

std::string NameFor(const char* purpose) {
    return UniqueName(std::string("{") + purpose + "}#");
}

using Waits = EachClock;
INSTANTIATE_FOR_EACH_CLOCK(Waits);

/// Several threads count, one at a time.
template <class Enter, class Leave>
void ExpectExclusion(Enter enter, Leave leave) {
    int counter = 0;
    const auto count = [&] {
        for (int i = 0; i < 300; ++i) {
            enter();
            const int before = counter;
            if (i % 16 == 0) {
                SleepMilliseconds(0);
            }
            counter = before + 1;
            leave();
        }
    };
    {
        TestThread first(count);
        TestThread second(count);
        TestThread third(count);
    }
    EXPECT_EQ(counter, 900);
}

TEST_P(Waits, RefuseWhatIsNoHandleOrNamesAnotherKindOfObject) {
    const Handle gone = MakeAutoResetEvent();
    const OwnedHandle event(MakeAutoResetEvent());
    const OwnedHandle mutex(MakeMutex(""));
    EXPECT_TRUE(Close(gone));  // last, so that neither is given its number
    const auto expectInvalid = [](bool isFailure) { EXPECT_EQ(ErrorOf(!isFailure), Errors::InvalidHandle); };
    for (const Handle handle : {NoHandle, InvalidHandle(), gone}) {
        expectInvalid(Wait(handle, 0) == WaitResult::Failed);
        expectInvalid(WaitAny(std::array{event.Get(), handle}, 0).result == WaitResult::Failed);
        expectInvalid(SignalAndWait(event.Get(), handle, 0) == WaitResult::Failed);
        expectInvalid(SignalAndWait(handle, event.Get(), 0) == WaitResult::Failed);
        expectInvalid(!SignalEvent(handle));
        expectInvalid(!ReleaseMutex(handle));
        expectInvalid(!ReleaseSemaphore(handle, 1));
    }
    expectInvalid(!SignalEvent(mutex.Get()));
    expectInvalid(!Close(NoHandle));
    expectInvalid(!ReleaseMutex(event.Get()));
    expectInvalid(!ReleaseSemaphore(event.Get(), 1));
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::TimedOut);
}

TEST_P(Waits, TakeOnlyTheFirstOfAtMostSixtyFourObjects) {
    const OwnedHandle semaphore(MakeSemaphore(1, 1, ""));
    const OwnedHandle mutex(MakeMutex(""));
    std::vector<OwnedHandle> events;
    std::vector<Handle> objects;
    for (int i = 0; i < 62; ++i) {
        objects.push_back(events.emplace_back(MakeAutoResetEvent()).Get());
    }
    objects.insert(objects.end(), {semaphore.Get(), mutex.Get()});
    for (const std::size_t expected : {62U, 63U}) {
        EXPECT_EQ(Outcome(WaitAny(objects, 0)), std::pair(WaitResult::Signalled, expected));
    }
    SignalEvent(objects[0]);
    ReleaseSemaphore(semaphore.Get(), 1);
    EXPECT_EQ(WaitAny(objects, 0).index, 0u);
    EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::Signalled);
    objects.push_back(events.emplace_back(MakeAutoResetEvent()).Get());
    for (const auto& refused : {std::vector<Handle>{}, objects}) {
        EXPECT_EQ(ErrorOf(WaitAny(refused, 0).result != WaitResult::Failed), Errors::InvalidParameter);
    }
}

TEST_P(Waits, EndWithWhicheverObjectComesFirstAndOutlastAClosedHandle) {
    const OwnedHandle first(MakeAutoResetEvent());
    const OwnedHandle second(MakeAutoResetEvent());
    OwnedHandle third(MakeAutoResetEvent());
    WaitAnyResult outcome{};
    std::atomic<int> begun = 0;
    TestThread waiting([&, closed = third.Get()] {
        ++begun;
        outcome = WaitAny(std::array{first.Get(), second.Get(), closed}, LongTimeout);
    });
    LetSettle(begun, 1);
    third.Reset();
    SleepMilliseconds(1);
    SignalEvent(second.Get());
    SignalEvent(first.Get());
    waiting.Join();
    EXPECT_EQ(Outcome(outcome), std::pair(WaitResult::Signalled, std::size_t{1}));
    EXPECT_EQ(Wait(first.Get(), 0), WaitResult::Signalled) << "a wait that had ended took another signal";
}

TEST_P(Waits, ForAMutexAreRecursiveAndOfOneThread) {
    for (const std::string& name : {std::string(), NameFor("recursion")}) {
        const auto acquire = [&] {
            const OwnedHandle closed(MakeMutex(name));
            EXPECT_EQ(Wait(closed.Get(), 0), WaitResult::Signalled)
                << "a mutex nobody has a handle of is free";
        };
        acquire();
        TestThread(acquire).Join();
        const OwnedHandle mutex(MakeMutex(name));
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
        EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        TestThread([&] {
            EXPECT_EQ(Wait(mutex.Get(), 10), WaitResult::TimedOut);
            EXPECT_EQ(ErrorOf(ReleaseMutex(mutex.Get())), Errors::NotOwner);
        }).Join();
        EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        EXPECT_EQ(ErrorOf(ReleaseMutex(mutex.Get())), Errors::NotOwner);
        ExpectExclusion([&] { EXPECT_EQ(Wait(mutex.Get(), LongTimeout), WaitResult::Signalled); },
                        [&] { EXPECT_TRUE(ReleaseMutex(mutex.Get())); });
    }
}

/// To a thread that waits already, and to one that comes later.
TEST_P(Waits, TellTheNextOwnerOfAMutexWhenTheLastOneEnded) {
    for (const std::string& name : {std::string(), NameFor("abandoned")}) {
        const OwnedHandle mutex(MakeMutex(name));
        const OwnedHandle owned(MakeAutoResetEvent());
        for (const std::uint32_t lasts : {SettlingTime, 0U}) {
            TestThread owner([&] {
                Wait(mutex.Get(), 0);
                Wait(mutex.Get(), 0);
                SignalEvent(owned.Get());
                SleepMilliseconds(lasts);
            });
            EXPECT_EQ(Wait(owned.Get(), LongTimeout), WaitResult::Signalled);
            if (lasts == 0) {
                owner.Join();
            }
            EXPECT_EQ(Outcome(WaitAny(std::array{owned.Get(), mutex.Get()}, LongTimeout)),
                      std::pair(WaitResult::Abandoned, std::size_t{1}));
            EXPECT_TRUE(ReleaseMutex(mutex.Get())) << "an abandoned mutex has been acquired";
            EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled) << "it is told once";
            EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        }
    }
}

TEST_P(Waits, WithoutAHandleLastUntilTheLastUnlock) {
    RecursiveMutex mutex;
    ExpectExclusion([&] { mutex.lock(); }, [&] { mutex.unlock(); });
    std::atomic<bool> entered = false;
    mutex.lock();
    mutex.lock();
    TestThread other([&] {
        const std::lock_guard holder(mutex);
        entered = true;
    });
    mutex.unlock();
    SleepMilliseconds(SettlingTime);
    EXPECT_FALSE(entered);
    mutex.unlock();
}

TEST_P(Waits, ForASemaphoreAreCountedUpToItsMaximum) {
    for (const std::string& name : {std::string(), NameFor("semaphore")}) {
        const OwnedHandle semaphore(MakeSemaphore(1, 3, name));
        EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::Signalled);
        EXPECT_EQ(Wait(semaphore.Get(), 10), WaitResult::TimedOut);
        EXPECT_TRUE(ReleaseSemaphore(semaphore.Get(), 2));
        for (const std::int32_t tooMany : {2, 0x7FFFFFFF}) {
            EXPECT_EQ(ErrorOf(ReleaseSemaphore(semaphore.Get(), tooMany)), Errors::TooManyPosts);
        }
        EXPECT_FALSE(ReleaseSemaphore(semaphore.Get(), -1));
        EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::Signalled);
        EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::Signalled);
        EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::TimedOut);
        std::atomic<int> begun = 0;
        std::deque<TestThread> threads;
        for (int i = 0; i < 3; ++i) {
            threads.emplace_back([&] {
                ++begun;
                EXPECT_EQ(Wait(semaphore.Get(), LongTimeout), WaitResult::Signalled);
            });
        }
        LetSettle(begun, 3);
        EXPECT_TRUE(ReleaseSemaphore(semaphore.Get(), 2));
        SleepMilliseconds(SettlingTime);
        EXPECT_TRUE(ReleaseSemaphore(semaphore.Get(), 1));
        threads.clear();
        EXPECT_EQ(Wait(semaphore.Get(), 0), WaitResult::TimedOut) << "one wait for each of them";
    }
    for (const auto& [initial, maximum] : {std::pair(-1, 1), {0, 0}, {0, -1}, {2, 1}}) {
        EXPECT_EQ(ErrorOf(MakeSemaphore(initial, maximum, "") != NoHandle), Errors::InvalidParameter)
            << initial << " of " << maximum;
    }
}

TEST_P(Waits, WithASignalReleaseAMutex) {
    for (const std::string& name : {std::string(), NameFor("released")}) {
        const OwnedHandle mutex(MakeMutex(name));
        const OwnedHandle semaphore(MakeSemaphore(0, 1, ""));
        EXPECT_EQ(Wait(mutex.Get(), 0), WaitResult::Signalled);
        TestThread other([&] {
            EXPECT_EQ(Wait(mutex.Get(), LongTimeout), WaitResult::Signalled);
            EXPECT_TRUE(ReleaseSemaphore(semaphore.Get(), 1));
            EXPECT_TRUE(ReleaseMutex(mutex.Get()));
        });
        EXPECT_EQ(SignalAndWait(mutex.Get(), semaphore.Get(), LongTimeout), WaitResult::Signalled);
        EXPECT_EQ(ErrorOf(ReleaseMutex(mutex.Get())), Errors::NotOwner);
        EXPECT_EQ(SignalAndWait(semaphore.Get(), semaphore.Get(), 0), WaitResult::Signalled);
    }
}

TEST_P(Waits, WithASignalThatFailsDoNotBegin) {
    const OwnedHandle event(MakeAutoResetEvent());
    const OwnedHandle mutex(MakeMutex(""));
    const OwnedHandle full(MakeSemaphore(1, 1, ""));
    const TestThread thread([] {});
    SignalEvent(event.Get());
    for (const auto& [toSignal, code] : {std::pair(mutex.Get(), Errors::NotOwner),
                                         {full.Get(), Errors::TooManyPosts},
                                         {thread.Get(), Errors::InvalidHandle}}) {
        EXPECT_EQ(ErrorOf(SignalAndWait(toSignal, event.Get(), LongTimeout) != WaitResult::Failed), code);
    }
    EXPECT_EQ(Wait(event.Get(), 0), WaitResult::Signalled) << "the wait took the signal all the same";
}

}  // namespace
}  // namespace Varnholt::Platform
