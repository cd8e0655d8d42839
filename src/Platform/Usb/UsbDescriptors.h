#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// The endpoints of interface 0, alternate setting 0, found in a run of descriptors, as a configuration or
/// the kernel gives them. Descriptors that are cut short or broken end the search.
std::vector<EndpointInfo> EndpointsOfFirstInterface(std::span<const std::uint8_t> descriptors);

}  // namespace Varnholt::Platform::Usb
