#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {

/// Numbers set aside for tests; the driver looks at neither.
inline constexpr std::uint16_t VendorId = 0x1209;
inline constexpr std::uint16_t ProductId = 0x0001;
inline constexpr std::uint16_t DeviceVersion = 0x0100;

inline constexpr std::uint8_t VendorClass = 0xFF;
inline constexpr std::uint8_t ConfigurationValue = 1;
inline constexpr std::uint16_t BulkPacketSize = 512;

inline constexpr std::array Endpoints{
    Platform::Usb::EndpointInfo{Protocol::BulkOutEndpoint, 2, BulkPacketSize},
    Platform::Usb::EndpointInfo{Protocol::BulkInEndpoint, 2, BulkPacketSize},
    Platform::Usb::EndpointInfo{Protocol::InterruptInEndpoint, 3, 8},
};

/// The descriptor that GET_DESCRIPTOR asks for by its value field (type in the high byte, index in the low);
/// empty when there is none.
std::vector<std::uint8_t> Descriptor(std::uint16_t typeAndIndex, const std::string& serial);

}  // namespace Varnholt::Simulator
