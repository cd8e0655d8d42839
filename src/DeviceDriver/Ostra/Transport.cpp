#include "DeviceDriver/Ostra/Transport.h"

#include "Utilities/Tools/Win32/SystemHelperWin.h"

namespace Varnholt::DeviceDriver::Ostra {

Transport HostTransport() {
    return Varnholt::Utilities::Tools::Is64BitOS() ? Transport::UsbIo : Transport::Native;
}

}  // namespace Varnholt::DeviceDriver::Ostra
