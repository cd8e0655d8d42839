#pragma once

#include <functional>
#include <memory>
#include <string>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

using Log = std::function<void(const std::string& line)>;

/// The same device; each transfer that ends is told to `log` as a line, in words where it is a command.
std::shared_ptr<Platform::Usb::UsbDevice> LogTransfers(std::shared_ptr<Platform::Usb::UsbDevice> device,
                                                       Log log);

}  // namespace Varnholt::Simulator
