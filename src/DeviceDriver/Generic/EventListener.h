#pragma once

#include <cstdint>

namespace Varnholt::DeviceDriver::Generic {

/// Codes of `EventListener::MessageFromDevice`; the parameter is 0 with both. That the device is gone is not
/// said while it is being closed, although closing ends the interrupt pipe as well.
inline constexpr std::uint32_t MessageDeviceGone = 20010;
inline constexpr std::uint32_t MessageButtonData = 20011;

/// Receiver of an instrument's messages. Never owned by what reports to it; called on the reporter's own
/// thread.
class EventListener {
  public:
    virtual ~EventListener() = default;
    virtual void MessageFromDevice(std::uint32_t code, std::uint32_t parameter) = 0;
};

}  // namespace Varnholt::DeviceDriver::Generic
