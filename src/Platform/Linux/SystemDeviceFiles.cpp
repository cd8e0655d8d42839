#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/Usb/SystemUsbBus.h"

namespace Varnholt::Platform {

DeviceFileSystem& SystemDeviceFiles() {
    static const auto files = Drivers::MakeDriverFileSystem(Usb::SystemUsbBus());
    return *files;
}

}  // namespace Varnholt::Platform
