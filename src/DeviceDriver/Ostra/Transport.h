#pragma once

namespace Varnholt::DeviceDriver::Ostra {

/// The two ways to an instrument.
enum class Transport {
    Native,  ///< over the instrument's own kernel driver
    UsbIo,   ///< over the USBIO driver
};

/// The one that this host uses: USBIO where `Is64BitOS` answers true, native otherwise.
Transport HostTransport();

}  // namespace Varnholt::DeviceDriver::Ostra
