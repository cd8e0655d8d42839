#pragma once

namespace Varnholt::Interface {

/// Lasts as long as one call of a host that may reach an instrument. The library of simulated instruments has
/// an implementation of its own.
class HostCall final {
  public:
    HostCall();
    ~HostCall();  // NOLINT(performance-trivially-destructible): not where instruments are simulated
    HostCall(const HostCall&) = delete;
    HostCall& operator=(const HostCall&) = delete;
};

}  // namespace Varnholt::Interface
