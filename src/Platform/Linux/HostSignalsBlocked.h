#pragma once

#include <signal.h>

#include <initializer_list>

namespace Varnholt::Platform::Linux {

/// Keeps the calling thread, and with it the threads that it starts meanwhile, from taking the signals that
/// belong to the host: their handlers must not find themselves on a thread that the host knows nothing of.
/// What reports a fault of the thread itself is never blocked, or a crash would pass the host's handler by.
/// The end of the object gives the thread the mask that it had.
class HostSignalsBlocked final {
  public:
    HostSignalsBlocked() {
        sigset_t blocked;
        sigfillset(&blocked);
        for (const int fault : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGABRT, SIGSYS}) {
            sigdelset(&blocked, fault);
        }
        pthread_sigmask(SIG_SETMASK, &blocked, &before_);
    }
    ~HostSignalsBlocked() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
    HostSignalsBlocked(const HostSignalsBlocked&) = delete;
    HostSignalsBlocked& operator=(const HostSignalsBlocked&) = delete;

  private:
    sigset_t before_{};
};

}  // namespace Varnholt::Platform::Linux
