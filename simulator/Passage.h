#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "FaultPlan.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

/// A transfer on its way through the injector: the copy that the device gets, and how far it is.
struct Passage : Platform::Usb::Transfer {
    enum class State {
        Held,          ///< not with the device
        Submitting,    ///< being handed to the device
        InDevice,      ///< accepted by the device
        HeldWithData,  ///< done by the device, waits for its cancellation
    };

    Platform::Usb::Transfer* original = nullptr;
    std::optional<Fault> fault;
    State state = State::Held;
    bool cancelWanted = false;
    bool wasHeld = false;                    // until it was late enough, or an interrupt endpoint was polled
    std::vector<std::uint8_t> replacedData;  // of an OUT transfer whose data are changed

    bool Has(FaultKind kind) const { return fault && fault->kind == kind; }
};
using PassagePointer = std::shared_ptr<Passage>;

}  // namespace Varnholt::Simulator
