// The USB/IP client: any bytes from the peer that it is connected to, and any descriptors from a device.
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdlib>

#include "Platform/Usb/UsbDescriptors.h"
#include "Platform/Usb/UsbIpDevice.h"
#include "Platform/Usb/UsbIpOperations.h"
#include "Support/TestTransfer.h"

using namespace Varnholt::Platform;
using namespace Varnholt::Platform::Usb;
using Varnholt::Tests::TestTransfer;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* input, std::size_t size) {
    constexpr std::size_t shortestEndpoint = 6;
    if (EndpointsOfFirstInterface({input, size}).size() > size / shortestEndpoint) {
        std::abort();
    }
    constexpr std::size_t most = 16384;  // stays in the socket: nobody reads on while it is written
    std::array<int, 2> ends{-1, -1};
    if (size > most || socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) {
        return 0;
    }
    if (send(ends[1], input, size, MSG_NOSIGNAL) != static_cast<ssize_t>(size)) {
        std::abort();
    }
    shutdown(ends[1], SHUT_WR);
    bool connected = false;
    const UsbIpConnector connect = [&](ErrorCode&) {
        connected = true;
        return ends[0];
    };
    if (size % 4 == 0) {
        UsbIpSocket socket(ends[0]);
        connected = true;
        FirstUsbIpDevice(socket);
    } else {
        std::array transfers{
            TestTransfer::VendorQuestion(Varnholt::Protocol::Request::GetMisc, 64),
            TestTransfer::In(Varnholt::Protocol::BulkInEndpoint, 64),
            TestTransfer::Out(Varnholt::Protocol::BulkOutEndpoint, std::vector<std::uint8_t>(64))};
        std::array<bool, transfers.size()> accepted{};
        {
            const auto device = MakeUsbIpDevice(connect, "1-1");
            if (device->Claim() == Errors::Success) {
                for (std::size_t i = 0; i < transfers.size(); ++i) {
                    accepted[i] = device->Submit(transfers[i]) == Errors::Success;
                }
                device->Cancel(transfers[1]);
            }
        }
        for (std::size_t i = 0; i < transfers.size(); ++i) {
            if (transfers[i].completions != (accepted[i] ? 1 : 0)) {
                std::abort();
            }
        }
    }
    if (!connected) {
        close(ends[0]);
    }
    close(ends[1]);
    return 0;
}
