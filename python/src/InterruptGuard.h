#pragma once

#include <pybind11/pybind11.h>

#include "Service/Interruption.h"

namespace Varnholt::Python {

/// For its life Ctrl-C asks the interruption to end what runs. On the interpreter's main thread, as long as
/// Python's own handler is set; elsewhere and with other handlers nothing, so that those run when the call
/// has ended. Under virtual time, where nothing takes long, nothing either. Made and ended with the
/// interpreter's lock held.
class InterruptGuard final {
  public:
    explicit InterruptGuard(Service::Interruption& interruption);
    ~InterruptGuard();
    InterruptGuard(const InterruptGuard&) = delete;
    InterruptGuard& operator=(const InterruptGuard&) = delete;

  private:
    const bool isSet_;
};

/// Raises what a signal's handler raises. With the interpreter's lock held; any thread.
void CheckSignals();

/// What ends a call that was interrupted: the handler's exception, or KeyboardInterrupt.
[[noreturn]] void RaiseInterrupt();

}  // namespace Varnholt::Python
