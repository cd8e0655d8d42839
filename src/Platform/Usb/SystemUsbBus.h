#pragma once

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// The instruments of this machine: those that are plugged in, then the simulated ones.
UsbBus& SystemUsbBus();

}  // namespace Varnholt::Platform::Usb
