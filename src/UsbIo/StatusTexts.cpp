#include "UsbIo/StatusTexts.h"

#include <algorithm>
#include <array>

namespace Varnholt::UsbIo {
namespace {

struct Row {
    std::uint32_t status;
    const char* text;
};

// 0xE8001000 is no slip of the pen: 0xE0001000 is taken by another status.
constexpr std::array rows{
    Row{0x00000000, "No error."},
    Row{0xE0000001, "HC Error: Wrong CRC."},
    Row{0xE0000002, "HC Error: Wrong bit stuffing."},
    Row{0xE0000003, "HC Error: Data toggle mismatch."},
    Row{0xE0000004, "HC Error: stall PID."},
    Row{0xE0000005, "HC Error: Device not responding."},
    Row{0xE0000006, "HC Error: PID check failed."},
    Row{0xE0000007, "HC Error: Unexpected PID."},
    Row{0xE0000008, "HC Error: Data Overrun."},
    Row{0xE0000009, "HC Error: Data Underrun."},
    Row{0xE000000A, "HC Error: Reserved1."},
    Row{0xE000000B, "HC Error: Reserved2."},
    Row{0xE000000C, "HC Error: Buffer Overrun."},
    Row{0xE000000D, "HC Error: Buffer Underrun."},
    Row{0xE000000F, "HC Error: Not accessed."},
    Row{0xE0000010, "HC Error: FIFO error."},
    Row{0xE0000011, "HC Error: XACT error."},
    Row{0xE0000012, "HC Error: Babble detected."},
    Row{0xE0000013, "HC Error: Data buffer error."},
    Row{0xE0000030, "USBD Error: Endpoint halted."},
    Row{0xE0000100, "USBD Error: No system memory."},
    Row{0xE0000200, "USBD Error: Invalid URB function."},
    Row{0xE0000300, "USBD Error: Invalid parameter."},
    Row{0xE0000400, "USBD Error: Busy."},
    Row{0xE0000500, "USBD Error: Request failed."},
    Row{0xE0000600, "USBD Error: Invalid pipe handle."},
    Row{0xE0000700, "USBD Error: No bandwidth available."},
    Row{0xE0000800, "USBD Error: Internal HC error."},
    Row{0xE0000900, "USBD Error: Short transfer."},
    Row{0xE0000A00, "USBD Error: Bad start frame."},
    Row{0xE0000B00, "USBD Error: Isochronous request failed."},
    Row{0xE0000C00, "USBD Error: Frame control owned."},
    Row{0xE0000D00, "USBD Error: Frame control not owned."},
    Row{0xE0000E00, "USBD Error: Not supported."},
    Row{0xE0000F00, "USBD Error: Invalid configuration descriptor."},
    Row{0xE8001000, "USBD Error: Insufficient resources."},
    Row{0xE0002000, "USBD Error: Set configuration failed."},
    Row{0xE0003000, "USBD Error: Buffer too small."},
    Row{0xE0004000, "USBD Error: Interface not found."},
    Row{0xE0005000, "USBD Error: Invalid pipe flags."},
    Row{0xE0006000, "USBD Error: Timeout."},
    Row{0xE0007000, "USBD Error: Device gone."},
    Row{0xE0008000, "USBD Error: Status not mapped."},
    Row{0xE0010000, "USBD Error: cancelled."},
    Row{0xE0020000, "USBD Error: ISO not accessed by hardware."},
    Row{0xE0030000, "USBD Error: ISO TD error."},
    Row{0xE0040000, "USBD Error: ISO NA late USB port."},
    Row{0xE0050000, "USBD Error: ISO not accessed, submitted too late."},
    Row{0xE0001000, "Operation failed."},
    Row{0xE0001001, "Input buffer too small."},
    Row{0xE0001002, "Output buffer too small."},
    Row{0xE0001003, "Out of memory."},
    Row{0xE0001004, "There are pending requests."},
    Row{0xE0001005, "USB device is already configured."},
    Row{0xE0001006, "USB device is not configured."},
    Row{0xE0001007, "There are open pipes."},
    Row{0xE0001008, "Either handle or pipe is already bound."},
    Row{0xE0001009, "Handle is not bound to a pipe."},
    Row{0xE000100A, "Device is removed."},
    Row{0xE000100B, "Control code is not supported."},
    Row{0xE000100C, "The request has been timed out."},
    Row{0xE000100D, "Invalid recipient."},
    Row{0xE000100E, "Invalid pipe type or invalid request type."},
    Row{0xE000100F, "Invalid I/O control code."},
    Row{0xE0001010, "Invalid direction of read/write operation."},
    Row{0xE0001011, "Too much ISO packets."},
    Row{0xE0001012, "Request pool empty."},
    Row{0xE0001013, "Pipe not found."},
    Row{0xE0001014, "Invalid ISO packet."},
    Row{0xE0001015, "Out of address space. Not enough system resources."},
    Row{0xE0001016, "Interface not found."},
    Row{0xE0001017, "Invalid device state (stopped or power down)."},
    Row{0xE0001018, "Invalid parameter."},
    Row{0xE000101A, "Power state not allowed. Set to D0 first."},
    Row{0xE000101B, "Device powered down."},
    Row{0xE000101C, "API Version does not match."},
    Row{0xE000101D, "Set configuration failed."},
    Row{0xE000101F, "Invalid process."},
    Row{0xE0001020, "The device is acquired by another process for exclusive use."},
    Row{0xE0001021, "A different process has opened the device."},
    Row{0xE0001100, "Device not found or acquired for exclusive use."},
    Row{0xE0001102, "Device not open."},
    Row{0xE0001104, "No such device instance."},
    Row{0xE0001105, "An invalid parameter was passed."},
    Row{0xE0001107, "The handle is already opened."},
};

}  // namespace

const char* StatusText(std::uint32_t status) {
    const auto* const row = std::find_if(
        rows.begin(), rows.end(), [status](const Row& candidate) { return candidate.status == status; });
    return row == rows.end() ? "Windows system error code." : row->text;
}

}  // namespace Varnholt::UsbIo
