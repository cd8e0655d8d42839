#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/DriverFileSystem.h"
#include "Platform/Usb/UdevBus.h"

namespace Varnholt::Platform {

DeviceFileSystem& SystemDeviceFiles() {
    static const auto files = Drivers::MakeDriverFileSystem(Usb::RealUsbBus());
    return *files;
}

}  // namespace Varnholt::Platform
