#pragma once

#include <signal.h>

namespace Varnholt::Platform::Linux {

/// Keeps the calling thread, and with it the threads that it starts meanwhile, from taking the signals that
/// belong to the host: their handlers must not find themselves on a thread that the host knows nothing of.
/// What reports a fault of the thread itself is never blocked, or a crash would pass the host's handler by.
/// The end of the object gives the thread the mask that it had.
class HostSignalsBlocked final {
  public:
    HostSignalsBlocked();
    ~HostSignalsBlocked();
    HostSignalsBlocked(const HostSignalsBlocked&) = delete;
    HostSignalsBlocked& operator=(const HostSignalsBlocked&) = delete;

  private:
    sigset_t before_{};
};

}  // namespace Varnholt::Platform::Linux
