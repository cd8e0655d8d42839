#pragma once

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// libusb's result codes (LIBUSB_ERROR_...) and transfer statuses (LIBUSB_TRANSFER_...) in the platform's
/// terms.
ErrorCode ErrorFromLibUsb(int libusbError);
TransferStatus StatusFromLibUsb(int libusbTransferStatus);

}  // namespace Varnholt::Platform::Usb
