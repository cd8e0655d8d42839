#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// In front of a simulated instrument's own name where it stands among others.
inline constexpr const char* SimulatedPrefix = "simulated-";

/// A simulated instrument of this machine.
struct SimulatorInfo {
    std::string name;          ///< with the prefix
    std::uint32_t userId = 0;  ///< who runs it
    int processId = 0;
    bool usable = false;  ///< false: it is another user's, and neither listed on the bus nor opened
    std::string usedBy;   ///< who has it opened, as the simulator tells; empty when nobody has
    bool answers = true;  ///< false: it listens but does not answer; who runs it may be unknown (process 0)
};

/// All of them, ordered by name. One that does not answer takes a second.
std::vector<SimulatorInfo> ListSimulators();

/// The bus of the simulated instruments that run as programs of the same user.
UsbBus& SimulatorBus();

}  // namespace Varnholt::Platform::Usb
