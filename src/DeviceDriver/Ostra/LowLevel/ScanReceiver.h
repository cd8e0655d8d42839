#pragma once

#include <cstdint>
#include <span>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// Takes the data of a scan while they arrive, so that a scan needs no more memory than a few transfers.
class ScanReceiver {
  public:
    virtual ~ScanReceiver() = default;

    /// The next bytes of the scan, in order and of any number, on the thread of `StartScan`, while the
    /// transfer behind them runs already. They are there for the call only. What it throws ends the scan and
    /// leaves `StartScan`, like everything that does: what is no exception of the library becomes one, with
    /// its text alone.
    virtual void Receive(std::span<const std::uint8_t> data) = 0;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
