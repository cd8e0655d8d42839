#pragma once

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <ostream>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Platform::Usb {
inline void PrintTo(TransferStatus status, std::ostream* stream) {
    constexpr std::array names{"Completed", "Stalled", "IoError", "Overflow", "Cancelled", "DeviceGone"};
    *stream << names.at(static_cast<std::size_t>(status));
}
}  // namespace Varnholt::Platform::Usb

namespace Varnholt::Tests {

namespace Errors = Platform::Errors;

/// A transfer with its buffer that counts its completions, on whatever thread they come.
struct TestTransfer final : Platform::Usb::Transfer, private Platform::Usb::TransferClient {
    using Bytes = std::vector<std::uint8_t>;

    std::vector<std::uint8_t> buffer;
    std::atomic<int> completions = 0;

    static TestTransfer In(std::uint8_t inEndpoint, std::uint32_t bytes) {
        return TestTransfer(inEndpoint, {}, Bytes(bytes, Untouched));
    }
    static TestTransfer Out(std::uint8_t outEndpoint, Bytes bytes) {
        return TestTransfer(outEndpoint, {}, std::move(bytes));
    }
    static TestTransfer Vendor(Protocol::Request vendorRequest, Bytes bytes = {}, std::uint16_t value = 0) {
        const auto length = static_cast<std::uint16_t>(bytes.size());
        return Control({Protocol::VendorOut, static_cast<std::uint8_t>(vendorRequest), value, 0, length},
                       std::move(bytes));
    }
    static TestTransfer VendorQuestion(Protocol::Request vendorRequest, std::uint16_t bytes) {
        return Control({Protocol::VendorIn, static_cast<std::uint8_t>(vendorRequest), 0, 0, bytes},
                       Bytes(bytes, Untouched));
    }
    static TestTransfer Control(const Platform::Usb::SetupPacket& packet, Bytes bytes) {
        return TestTransfer(0, packet, std::move(bytes));
    }
    /// A vendor request that names a part of the memory.
    static TestTransfer Memory(Protocol::Request vendorRequest, std::uint32_t address, std::uint16_t count) {
        return Vendor(vendorRequest, AddressAndLength(address, count));
    }
    static Bytes AddressAndLength(std::uint32_t address, std::uint16_t count) {
        Bytes bytes(8);
        Protocol::StoreBig32(&bytes[0], address);
        Protocol::StoreBig16(&bytes[4], count);
        return bytes;
    }
    static constexpr std::uint8_t Untouched = 0xA5;

    /// True once it has completed; gives up after a time that is long for any of it.
    bool Wait(std::chrono::milliseconds patience = std::chrono::seconds(20)) {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, patience, [this] { return completions > 0; });
    }
    /// It has ended, or does so soon, once and with this status.
    void ExpectEnd(Platform::Usb::TransferStatus expected) {
        EXPECT_TRUE(Wait());
        EXPECT_EQ(std::pair(expected, 1), std::pair(status, completions.load()));
    }
    Bytes Data() const {
        return {buffer.begin(), buffer.begin() + static_cast<std::ptrdiff_t>(actualLength)};
    }

  private:
    TestTransfer(std::uint8_t usbEndpoint, const Platform::Usb::SetupPacket& packet, Bytes bytes)
        : buffer(std::move(bytes)) {
        endpoint = usbEndpoint;
        setup = packet;
        data = buffer.data();
        length = static_cast<std::uint32_t>(buffer.size());
        client = this;
        actualLength = 0xFFFFFFFF;
    }
    void TransferCompleted(Platform::Usb::Transfer&) noexcept override {
        const std::lock_guard lock(mutex_);
        ++completions;
        changed_.notify_all();
    }

    std::mutex mutex_;
    std::condition_variable changed_;
};

/// Does a transfer and gives the bytes that came.
inline TestTransfer::Bytes Do(
    Platform::Usb::UsbDevice& device, TestTransfer&& transfer,
    Platform::Usb::TransferStatus status = Platform::Usb::TransferStatus::Completed) {
    EXPECT_EQ(Errors::Success, device.Submit(transfer));
    transfer.ExpectEnd(status);
    return transfer.Data();
}

}  // namespace Varnholt::Tests
