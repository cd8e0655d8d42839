#pragma once

#include <cstdint>

#include "Protocol/Instrument.h"
#include "Service/OpenedInstrument.h"
#include "Service/ScanRecorder.h"

namespace Varnholt::Service {

inline constexpr std::uint32_t LongestScanRecord = 6553;  ///< bytes

struct ScanSettings {
    std::uint32_t recordSize = Protocol::ReadoutBytes;  ///< 1 to `LongestScanRecord`
    /// Bytes; 0: until the instrument stops. Over the transport native a multiple of the record size, as the
    /// driver drops a last record that is not whole.
    std::uint32_t total = 0;
    std::uint32_t timeout = 5;  ///< seconds that a transfer may take
};

/// Scans with an instrument that is prepared, until the total is there, the instrument stops, the sink fails
/// or the user wants to end. `report` is right after a failure too. A scan that ends on this side leaves an
/// instrument that has been reset.
void RunScan(OpenedInstrument& instrument, const ScanSettings& settings, const RecordSink& sink,
             ScanReport& report);

}  // namespace Varnholt::Service
