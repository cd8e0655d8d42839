#include "Service/Holder.h"

#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"
#include "Service/Instruments.h"
#include "Service/Linux/DeviceHolder.h"

namespace Varnholt::Service {

std::string HolderOf(const std::string& identifier) {
    const std::string name = ShortNameOf(identifier);
    for (const auto& device : Platform::Usb::ListRegisteredDevices()) {
        if (device.name == name) {
            return FindHolder(device.deviceNode);
        }
    }
    for (const auto& simulator : Platform::Usb::ListSimulators()) {
        if (simulator.name == name) {
            return simulator.usedBy;
        }
    }
    return {};
}

}  // namespace Varnholt::Service
