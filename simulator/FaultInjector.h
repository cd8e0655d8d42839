#pragma once

#include <functional>
#include <memory>

#include "FaultPlan.h"
#include "Platform/EventScheduler.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

/// The same device with the faults of a script. When a fault unplugs it, `unplug` is called once, if there is
/// one, on the thread of the transfer; the result stays without a device from then on. `scheduler` must
/// outlive the result.
std::shared_ptr<Platform::Usb::UsbDevice> InjectFaults(std::shared_ptr<Platform::Usb::UsbDevice> device,
                                                       std::shared_ptr<FaultScript> script,
                                                       Platform::EventScheduler& scheduler,
                                                       std::function<void()> unplug = {});

}  // namespace Varnholt::Simulator
