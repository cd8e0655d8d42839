#include <array>
#include <cstdlib>

#include "ForkedProcess.h"
#include "Platform/EventScheduler.h"
#include "Platform/Linux/HostSignalsBlocked.h"
#include "Support/SignalMasks.h"
#include "TestThread.h"

namespace Varnholt::Platform {
namespace {

TEST(HostSignals, AreNotTakenByAThreadOfThePlatform) {
    const OwnedHandle end(MakeAutoResetEvent());
    TestThread thread([&] { Wait(end.Get(), LongTimeout); });
    Tests::ExpectOtherThreadsBlockHostSignals();
    SignalEvent(end.Get());
}

TEST(HostSignals, ComeBackAsTheyWere) {
    const auto isBlocked = [](int number) {
        sigset_t mask;
        pthread_sigmask(SIG_SETMASK, nullptr, &mask);
        return sigismember(&mask, number) == 1;
    };
    const auto state = [&] { return std::array{isBlocked(SIGUSR1), isBlocked(SIGUSR2), isBlocked(SIGFPE)}; };
    sigset_t own;
    sigset_t before;
    sigemptyset(&own);
    sigaddset(&own, SIGUSR2);
    sigaddset(&own, SIGFPE);
    pthread_sigmask(SIG_SETMASK, &own, &before);
    {
        const Linux::HostSignalsBlocked blocked;
        EXPECT_EQ(state(), (std::array{true, true, false}));
    }
    EXPECT_EQ(state(), (std::array{false, true, true}));
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
}

TEST(HostProcess, EndsInAForkedChildWhileAnEventIsAwaited) {
    EventScheduler& scheduler = ClockScheduler();
    scheduler.CallAt(
        scheduler.Now() + 60'000'000, [] {}, this);
    // AddressSanitizer's heap stays locked in the child if the scheduler's thread uses it at the moment of
    // the fork.
    const OwnedHandle begun(MakeAutoResetEvent());
    scheduler.CallAt(
        scheduler.Now(), [&] { SignalEvent(begun.Get()); }, &begun);
    ASSERT_EQ(Wait(begun.Get(), LongTimeout), WaitResult::Signalled);
    scheduler.Forget(&begun);
    ForkedProcess child([]() -> int {
        alarm(20);
        std::exit(7);
    });
    EXPECT_EQ(child.WaitForExit(), 7);
    scheduler.Forget(this);
}

}  // namespace
}  // namespace Varnholt::Platform
