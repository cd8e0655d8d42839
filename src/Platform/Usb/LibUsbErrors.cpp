#include "Platform/Usb/LibUsbErrors.h"

#include <libusb-1.0/libusb.h>

#include <utility>

#include "Platform/LookUp.h"

namespace Varnholt::Platform::Usb {
namespace {

/// All others are `Errors::GeneralFailure`: LIBUSB_ERROR_IO, _PIPE, _OVERFLOW, _OTHER.
constexpr std::pair<int, ErrorCode> Codes[] = {
    {LIBUSB_SUCCESS, Errors::Success},
    {LIBUSB_ERROR_ACCESS, Errors::AccessDenied},
    {LIBUSB_ERROR_NO_DEVICE, Errors::DeviceNotConnected},
    {LIBUSB_ERROR_NOT_FOUND, Errors::FileNotFound},
    {LIBUSB_ERROR_BUSY, Errors::Busy},
    {LIBUSB_ERROR_TIMEOUT, Errors::SemaphoreTimeout},
    {LIBUSB_ERROR_INVALID_PARAM, Errors::InvalidParameter},
    {LIBUSB_ERROR_NO_MEM, Errors::NotEnoughMemory},
    {LIBUSB_ERROR_NOT_SUPPORTED, Errors::NotSupported},
    {LIBUSB_ERROR_INTERRUPTED, Errors::OperationAborted},
};

/// All others are `TransferStatus::IoError`.
constexpr std::pair<int, TransferStatus> Statuses[] = {
    {LIBUSB_TRANSFER_COMPLETED, TransferStatus::Completed},
    {LIBUSB_TRANSFER_STALL, TransferStatus::Stalled},
    {LIBUSB_TRANSFER_OVERFLOW, TransferStatus::Overflow},
    {LIBUSB_TRANSFER_NO_DEVICE, TransferStatus::DeviceGone},
    {LIBUSB_TRANSFER_CANCELLED, TransferStatus::Cancelled},
    {LIBUSB_TRANSFER_TIMED_OUT, TransferStatus::Cancelled},
};

}  // namespace

ErrorCode ErrorFromLibUsb(int libusbError) {
    return LookUp(Codes, libusbError, Errors::GeneralFailure);
}

TransferStatus StatusFromLibUsb(int libusbTransferStatus) {
    return LookUp(Statuses, libusbTransferStatus, TransferStatus::IoError);
}

}  // namespace Varnholt::Platform::Usb
