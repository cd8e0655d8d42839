#include <gtest/gtest.h>
#include <libusb-1.0/libusb.h>

#include "Platform/Usb/LibUsbErrors.h"

namespace Varnholt::Platform::Usb {
namespace {

TEST(LibUsbErrors, BecomeThePlatformsCodes) {
    struct Case {
        int libusb;
        ErrorCode code;
    };
    for (const Case& row : {
             Case{LIBUSB_SUCCESS, 0},
             Case{LIBUSB_ERROR_NOT_FOUND, 2},
             Case{LIBUSB_ERROR_ACCESS, 5},
             Case{LIBUSB_ERROR_NO_MEM, 8},
             Case{LIBUSB_ERROR_IO, 31},
             Case{LIBUSB_ERROR_PIPE, 31},
             Case{LIBUSB_ERROR_OVERFLOW, 31},
             Case{LIBUSB_ERROR_OTHER, 31},
             Case{LIBUSB_ERROR_NOT_SUPPORTED, 50},
             Case{LIBUSB_ERROR_INVALID_PARAM, 87},
             Case{LIBUSB_ERROR_TIMEOUT, 121},
             Case{LIBUSB_ERROR_BUSY, 170},
             Case{LIBUSB_ERROR_INTERRUPTED, 995},
             Case{LIBUSB_ERROR_NO_DEVICE, 1167},
             Case{-1000, 31},
         }) {
        EXPECT_EQ(ErrorFromLibUsb(row.libusb), row.code) << libusb_error_name(row.libusb);
    }
}

TEST(LibUsbErrors, BecomeTransferStatuses) {
    struct Case {
        int libusb;
        TransferStatus status;
    };
    for (const Case& row : {
             Case{LIBUSB_TRANSFER_COMPLETED, TransferStatus::Completed},
             Case{LIBUSB_TRANSFER_ERROR, TransferStatus::IoError},
             Case{LIBUSB_TRANSFER_TIMED_OUT, TransferStatus::Cancelled},
             Case{LIBUSB_TRANSFER_CANCELLED, TransferStatus::Cancelled},
             Case{LIBUSB_TRANSFER_STALL, TransferStatus::Stalled},
             Case{LIBUSB_TRANSFER_NO_DEVICE, TransferStatus::DeviceGone},
             Case{LIBUSB_TRANSFER_OVERFLOW, TransferStatus::Overflow},
             Case{1000, TransferStatus::IoError},
         }) {
        EXPECT_EQ(StatusFromLibUsb(row.libusb), row.status) << row.libusb;
    }
}

}  // namespace
}  // namespace Varnholt::Platform::Usb
