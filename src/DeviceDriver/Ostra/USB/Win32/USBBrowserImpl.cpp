#include "DeviceDriver/Ostra/USB/Win32/USBBrowserImpl.h"

#include <vector>

#include "DeviceDriver/Ostra/LowLevel/Win32/PellandoUSBDevice.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

std::list<std::string> USBBrowserImpl_PC::GetDevices(const std::int32_t&) try {
    const std::vector<std::string> paths = LowLevel::PellandoUSBDevice::GetAllDevices();
    return {paths.begin(), paths.end()};
}
TRACED

bool USBBrowserImpl_PC::IsAnyOstraConnected() try { return !GetDevices(0).empty(); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::USB
