#include <fmt/format.h>

#include "Holder.h"
#include "Instrument.h"
#include "Platform/Usb/DeviceHolders.h"
#include "Platform/Usb/SimulatorBus.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Cli {

std::string HolderOf(const std::string& identifier) {
    const std::string name = ShortNameOf(identifier);
    for (const auto& device : Platform::Usb::ListRegisteredDevices()) {
        if (device.name != name) {
            continue;
        }
        for (const auto& holder : Platform::Usb::FindHolders(device.deviceNode)) {
            return fmt::format("{} (process {})", holder.name, holder.processId);
        }
    }
    for (const auto& simulator : Platform::Usb::ListSimulators()) {
        if (simulator.name == name) {
            return simulator.usedBy;
        }
    }
    return {};
}

}  // namespace Varnholt::Cli
