#include "Platform/Usb/LibUsbErrors.h"

#include <libusb-1.0/libusb.h>

namespace Varnholt::Platform::Usb {

ErrorCode ErrorFromLibUsb(int libusbError) {
    switch (libusbError) {
        case LIBUSB_SUCCESS:
            return Errors::Success;
        case LIBUSB_ERROR_ACCESS:
            return Errors::AccessDenied;
        case LIBUSB_ERROR_NO_DEVICE:
            return Errors::DeviceNotConnected;
        case LIBUSB_ERROR_NOT_FOUND:
            return Errors::FileNotFound;
        case LIBUSB_ERROR_BUSY:
            return Errors::Busy;
        case LIBUSB_ERROR_TIMEOUT:
            return Errors::SemaphoreTimeout;
        case LIBUSB_ERROR_INVALID_PARAM:
            return Errors::InvalidParameter;
        case LIBUSB_ERROR_NO_MEM:
            return Errors::NotEnoughMemory;
        case LIBUSB_ERROR_NOT_SUPPORTED:
            return Errors::NotSupported;
        case LIBUSB_ERROR_INTERRUPTED:
            return Errors::OperationAborted;
        default:  // LIBUSB_ERROR_IO, _PIPE, _OVERFLOW, _OTHER
            return Errors::GeneralFailure;
    }
}

TransferStatus StatusFromLibUsb(int libusbTransferStatus) {
    switch (libusbTransferStatus) {
        case LIBUSB_TRANSFER_COMPLETED:
            return TransferStatus::Completed;
        case LIBUSB_TRANSFER_STALL:
            return TransferStatus::Stalled;
        case LIBUSB_TRANSFER_OVERFLOW:
            return TransferStatus::Overflow;
        case LIBUSB_TRANSFER_NO_DEVICE:
            return TransferStatus::DeviceGone;
        case LIBUSB_TRANSFER_CANCELLED:
        case LIBUSB_TRANSFER_TIMED_OUT:
            return TransferStatus::Cancelled;
        default:
            return TransferStatus::IoError;
    }
}

}  // namespace Varnholt::Platform::Usb
