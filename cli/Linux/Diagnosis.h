#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "ExitCode.h"
#include "Failure.h"
#include "Platform/Usb/DeviceHolders.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"
#include "Session.h"

namespace Varnholt::Cli {

/// One thing that was looked at.
struct Finding {
    enum class Level { Good, Note, Problem };
    Level level;
    std::string subject;  ///< the device or simulator; empty: the machine
    std::string text;
    std::string fix;  ///< what to do; empty when nothing is to be done
    ExitCode code = ExitCode::Success;
};

/// What can be seen of a device without opening it.
struct DeviceFacts {
    Platform::Usb::UsbDeviceInfo info;
    bool hasEndpoints = true;  ///< the instrument's
    bool isAccessible = true;  ///< its node may be read and written
    std::vector<Platform::Usb::DeviceHolder> holders;
};
struct MachineFacts {
    std::vector<DeviceFacts> devices;
    std::vector<Platform::Usb::SimulatorInfo> simulators;
};

/// What came of opening an instrument and asking it something.
struct Answer {
    std::uint16_t firmware = 0;
    std::optional<FailureReport> failure;
};
/// Opens the instrument with this short name.
using Trial = std::function<Answer(const std::string& shortName)>;

/// What is wrong, and what to do; tries the instruments that are free.
std::vector<Finding> Judge(const MachineFacts& facts, const Trial& trial);

/// Looks at everything that could be an instrument, and opens (and thereby resets) those that are free.
std::vector<Finding> Diagnose(Session& session);

}  // namespace Varnholt::Cli
