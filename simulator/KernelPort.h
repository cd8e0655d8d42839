#pragma once

#include <cstdint>

namespace Varnholt::Simulator {

/// Plugs a device into a free port of the Linux kernel's virtual USB host (module vhci-hcd), and answers the
/// port's number. The device is at the other end of `connectedSocket`, a high-speed one named `deviceId`. The
/// kernel keeps the socket: the caller may close its own file of it. Closing the other end unplugs the
/// device. Throws `std::runtime_error` with a text for people.
unsigned PlugIntoKernel(int connectedSocket, std::uint32_t deviceId);

}  // namespace Varnholt::Simulator
