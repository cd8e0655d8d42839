// The USB/IP client: any bytes from the peer that it is connected to, and any descriptors from a device.
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <cstdlib>

#include "Platform/Usb/UsbDescriptors.h"
#include "Platform/Usb/UsbIpDevice.h"
#include "Protocol/Instrument.h"

namespace {

using namespace Varnholt::Platform;
using namespace Varnholt::Platform::Usb;

class CountedTransfer final : public Transfer, private TransferClient {
  public:
    explicit CountedTransfer(std::uint8_t usbEndpoint) {
        endpoint = usbEndpoint;
        setup = {0xC0, 0xC9, 0, 0, static_cast<std::uint16_t>(buffer_.size())};
        data = buffer_.data();
        length = static_cast<std::uint32_t>(buffer_.size());
        client = this;
    }
    int Completions() const { return completions_; }

  private:
    void TransferCompleted(Transfer&) noexcept override { ++completions_; }

    std::array<std::uint8_t, 64> buffer_{};
    std::atomic<int> completions_ = 0;
};

}  // namespace

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
        ListUsbIpDevices(connect);
    } else {
        std::array transfers{CountedTransfer(0), CountedTransfer(Varnholt::Protocol::BulkInEndpoint),
                             CountedTransfer(Varnholt::Protocol::BulkOutEndpoint)};
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
            if (transfers[i].Completions() != (accepted[i] ? 1 : 0)) {
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
