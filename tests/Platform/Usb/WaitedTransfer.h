#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Platform::Usb {

/// A transfer with its buffer, completed on any thread.
class WaitedTransfer final : public Transfer, private TransferClient {
  public:
    WaitedTransfer(std::uint8_t usbEndpoint, std::vector<std::uint8_t> bytes) : buffer(std::move(bytes)) {
        endpoint = usbEndpoint;
        data = buffer.data();
        length = static_cast<std::uint32_t>(buffer.size());
        client = this;
    }
    static std::vector<std::uint8_t> Room(std::size_t size) { return std::vector<std::uint8_t>(size, 0xA5); }
    WaitedTransfer(const SetupPacket& packet, std::vector<std::uint8_t> bytes)
        : WaitedTransfer(std::uint8_t{0}, std::move(bytes)) {
        setup = packet;
        setup.length = static_cast<std::uint16_t>(length);
    }
    WaitedTransfer(Protocol::Request request, std::vector<std::uint8_t> bytes)
        : WaitedTransfer(SetupPacket{Protocol::VendorOut, static_cast<std::uint8_t>(request), 0, 0, 0},
                         std::move(bytes)) {}

    /// True once it has completed; gives up after a time that is long for any of it.
    bool Wait(std::chrono::milliseconds patience = std::chrono::seconds(20)) {
        std::unique_lock lock(mutex);
        return changed.wait_for(lock, patience, [this] { return completions > 0; });
    }
    int Completions() {
        const std::lock_guard lock(mutex);
        return completions;
    }
    std::vector<std::uint8_t> Data() const {
        return {buffer.begin(), buffer.begin() + static_cast<std::ptrdiff_t>(actualLength)};
    }

  private:
    void TransferCompleted(Transfer&) noexcept override {
        const std::lock_guard lock(mutex);
        ++completions;
        changed.notify_all();
    }

    std::vector<std::uint8_t> buffer;
    std::mutex mutex;
    std::condition_variable changed;
    int completions = 0;
};

}  // namespace Varnholt::Platform::Usb
