#pragma once

#include <optional>
#include <string>
#include <vector>

#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"
#include "Service/Finding.h"

namespace Varnholt::Service {

/// What can be seen of a device without opening it.
struct DeviceFacts {
    Platform::Usb::UsbDeviceInfo info;
    bool hasEndpoints = true;  ///< the instrument's
    bool isAccessible = true;  ///< its node may be read and written
    std::string group{};       ///< whose members may do so; empty: none
    std::string holder{};      ///< another process that has it open, as `FindHolder` tells it
};
/// How the user stands to the group that registered instruments belong to.
struct GroupFacts {
    std::string user;
    bool exists = true;
    bool isMember = false;      ///< by the system's user data
    bool isMemberHere = false;  ///< in this session
};
struct MachineFacts {
    std::vector<DeviceFacts> devices{};
    std::vector<Platform::Usb::SimulatorInfo> simulators{};
    bool hasUsb = true;
    GroupFacts group{};
    std::optional<Failure> missingLock{};  ///< why no instrument's lock can be had
    bool needsLock = true;                 ///< on the transport in force
};

/// What is wrong, and what to do; tries the instruments that are free.
std::vector<Finding> Judge(const MachineFacts& facts, const Trial& trial);

}  // namespace Varnholt::Service
