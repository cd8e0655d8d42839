#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "Capture/InterceptingDevice.h"
#include "FaultPlan.h"

namespace Varnholt::Simulator {

/// A transfer on its way through the fault injector.
struct FaultyTransfer : Capture::InterceptedTransfer {
    std::optional<Fault> fault;
    bool wasHeld = false;                    // until it was late enough, or an interrupt endpoint was polled
    std::vector<std::uint8_t> replacedData;  // of an OUT transfer whose data are changed

    bool Has(FaultKind kind) const { return fault && fault->kind == kind; }
};

}  // namespace Varnholt::Simulator
