#include "DeviceDriver/Ostra/USB/Win64/USBBrowserImpl_Win64.h"

#include "Protocol/MaximumDevices.h"
#include "UsbIo/CUsbIo.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::USB {

std::list<std::string> USBBrowserImpl_Win64::GetDevices(const std::int32_t&) try {
    const Protocol::Guid& interfaceClass = Protocol::UsbIoDriver::InterfaceClass;
    std::list<std::string> paths;
    UsbIo::CUsbIo device;
    const Platform::DeviceList list = UsbIo::CUsbIo::CreateDeviceList(&interfaceClass);
    if (!list) {
        return paths;
    }
    for (int number = 0; number < Protocol::MaximumDevices; ++number) {
        if (device.Open(number, list, &interfaceClass) != Protocol::UsbIoDriver::Status::Success) {
            break;
        }
        paths.emplace_back(device.GetDevicePathName());
        device.Close();
    }
    return paths;
}
TRACED

bool USBBrowserImpl_Win64::IsAnyOstraConnected() try { return !GetDevices(0).empty(); }
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::USB
