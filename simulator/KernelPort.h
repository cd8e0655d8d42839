#pragma once

#include <cstdint>
#include <string>

namespace Varnholt::Simulator {

/// A port of the Linux kernel's virtual USB host (module vhci-hcd), to which a device can be plugged in
/// through a socket. `folder` is where the kernel shows the host; tests name another.
inline constexpr const char* KernelPortFolder = "/sys/devices/platform/vhci_hcd.0";

/// Plugs the device at the other end of `connectedSocket`, a high-speed device named `deviceId`, into a free
/// port, and answers its number. The kernel keeps the socket: the caller may close its own file of it.
/// Closing the other end unplugs the device. Throws `std::runtime_error` with a text for people.
unsigned PlugIntoKernel(int connectedSocket, std::uint32_t deviceId,
                        const std::string& folder = KernelPortFolder);

}  // namespace Varnholt::Simulator
