#include <gtest/gtest.h>
#include <signal.h>

#include <stdexcept>

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

TEST(HostSignals, ComeBackAsTheyWereOnEveryWayOut) {
    const auto isBlocked = [](int number) {
        sigset_t mask;
        pthread_sigmask(SIG_SETMASK, nullptr, &mask);
        return sigismember(&mask, number) == 1;
    };
    sigset_t own;
    sigset_t before;
    sigemptyset(&own);
    sigaddset(&own, SIGUSR2);
    sigaddset(&own, SIGFPE);
    pthread_sigmask(SIG_SETMASK, &own, &before);
    EXPECT_THROW(
        {
            const Linux::HostSignalsBlocked blocked;
            EXPECT_TRUE(isBlocked(SIGUSR1));
            EXPECT_FALSE(isBlocked(SIGFPE));
            throw std::runtime_error("no thread");
        },
        std::runtime_error);
    EXPECT_FALSE(isBlocked(SIGUSR1));
    EXPECT_TRUE(isBlocked(SIGUSR2));
    EXPECT_TRUE(isBlocked(SIGFPE));
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
}

}  // namespace
}  // namespace Varnholt::Platform
