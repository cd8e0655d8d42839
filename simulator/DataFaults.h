#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include "FaultPlan.h"
#include "FaultyTransfer.h"

namespace Varnholt::Simulator {

/// The faults of a transfer's data: data that mean nothing, a wrong bit, the data of the transfer before. Any
/// thread.
class DataFaults final {
  public:
    /// The script must outlive the object.
    explicit DataFaults(const FaultScript& faultScript)
        : script_(faultScript), keepsData_(script_.Plan().Uses(FaultKind::Stale)) {}

    /// Gives a transfer out the wrong data in place of its own.
    void ReplaceOut(FaultyTransfer& transfer);
    /// Remembers what a transfer takes out.
    void KeepOut(const FaultyTransfer& transfer);

    /// Fills in the data of the transfer before and answers how many bytes they are; nothing when there are
    /// none to repeat.
    std::optional<std::uint32_t> RepeatIn(FaultyTransfer& transfer);
    /// Spoils what a transfer has brought in, and remembers it.
    void ChangeIn(FaultyTransfer& transfer);

  private:
    using Bytes = std::vector<std::uint8_t>;

    const FaultScript& script_;
    const bool keepsData_;

    std::mutex mutex_;                                         // guards what follows
    std::map<std::pair<std::uint8_t, bool>, Bytes> lastData_;  // by endpoint, and whether it came in
};

}  // namespace Varnholt::Simulator
