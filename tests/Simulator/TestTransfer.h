#pragma once

#include <algorithm>
#include <cstdint>
#include <initializer_list>
#include <numeric>
#include <ostream>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"
#include "TransferRecorder.h"

namespace Varnholt::Platform::Usb {
inline void PrintTo(TransferStatus status, std::ostream* stream) {
    *stream << Simulator::ToText(status);
}
}  // namespace Varnholt::Platform::Usb

namespace Varnholt::Simulator {

/// A transfer with its buffer that counts its completions.
struct TestTransfer final : Platform::Usb::Transfer, private Platform::Usb::TransferClient {
    std::vector<std::uint8_t> buffer;
    int completions = 0;

    static TestTransfer In(std::uint8_t inEndpoint, std::uint32_t bytes) {
        return TestTransfer(inEndpoint, {}, std::vector<std::uint8_t>(bytes, Untouched));
    }
    static TestTransfer Out(std::uint8_t outEndpoint, std::vector<std::uint8_t> bytes) {
        return TestTransfer(outEndpoint, {}, std::move(bytes));
    }
    static TestTransfer Vendor(Protocol::Request vendorRequest, std::vector<std::uint8_t> bytes = {},
                               std::uint16_t value = 0) {
        const auto length = static_cast<std::uint16_t>(bytes.size());
        return Control({Protocol::VendorOut, static_cast<std::uint8_t>(vendorRequest), value, 0, length},
                       std::move(bytes));
    }
    static TestTransfer VendorQuestion(Protocol::Request vendorRequest, std::uint16_t bytes) {
        return Control({Protocol::VendorIn, static_cast<std::uint8_t>(vendorRequest), 0, 0, bytes},
                       std::vector<std::uint8_t>(bytes, Untouched));
    }
    static TestTransfer Control(const Platform::Usb::SetupPacket& packet, std::vector<std::uint8_t> bytes) {
        return TestTransfer(0, packet, std::move(bytes));
    }
    static constexpr std::uint8_t Untouched = 0xA5;

    TestTransfer(const TestTransfer&) = delete;
    TestTransfer& operator=(const TestTransfer&) = delete;

    std::vector<std::uint8_t> Data() const {
        return {buffer.begin(), buffer.begin() + static_cast<std::ptrdiff_t>(actualLength)};
    }

  private:
    TestTransfer(std::uint8_t usbEndpoint, const Platform::Usb::SetupPacket& packet,
                 std::vector<std::uint8_t> bytes)
        : buffer(std::move(bytes)) {
        endpoint = usbEndpoint;
        setup = packet;
        data = buffer.data();
        length = static_cast<std::uint32_t>(buffer.size());
        client = this;
        actualLength = 0xFFFFFFFF;
    }
    void TransferCompleted(Platform::Usb::Transfer&) noexcept override { ++completions; }
};

}  // namespace Varnholt::Simulator
