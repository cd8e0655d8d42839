#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

#include "Protocol/UsbIoDriver.h"

/// The driver's records in host values, and the bytes that they travel as.
namespace Varnholt::UsbIo {

/// What the driver tells about itself.
struct DriverInfo {
    std::uint16_t interfaceVersion = 0;

    using Bytes = std::array<std::uint8_t, Protocol::UsbIoDriver::DriverInfoSize>;
    static DriverInfo Decode(const Bytes& bytes);
};

struct InterfaceSetting {
    std::uint16_t interfaceIndex = 0;
    std::uint16_t alternateSetting = 0;
    std::uint32_t maximumTransferSize = 0;  ///< bytes
};

/// Which configuration a device takes, with the settings of its interfaces.
struct Configuration {
    std::uint16_t index = 0;
    std::span<const InterfaceSetting> interfaces;  ///< at most `ConfigurationBlock::MaximumEntries`

    using Bytes = std::array<std::uint8_t, Protocol::UsbIoDriver::ConfigurationBlock::Size>;
    Bytes Encode() const;
};

/// A class or vendor request on endpoint 0; its direction and data length are those of the operation that
/// sends it.
struct ClassOrVendorRequest {
    std::uint32_t flags = 0;
    std::uint32_t type = Protocol::UsbIoDriver::RequestBlock::TypeVendor;
    std::uint32_t recipient = 0;    ///< 0: the device
    std::uint8_t reservedBits = 0;  ///< reserved bits of the setup packet's request type
    std::uint8_t request = 0;
    std::uint16_t value = 0;
    std::uint16_t index = 0;

    using Bytes = std::array<std::uint8_t, Protocol::UsbIoDriver::RequestBlock::Size>;
    Bytes Encode() const;
};

/// Two words whose meaning is the driver's.
struct DeviceParameters {
    std::array<std::uint32_t, 2> words{};

    using Bytes = std::array<std::uint8_t, Protocol::UsbIoDriver::DeviceParametersSize>;
    static DeviceParameters Decode(const Bytes& bytes);
    Bytes Encode() const;
};

}  // namespace Varnholt::UsbIo
