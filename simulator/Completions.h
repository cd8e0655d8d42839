#pragma once

#include <atomic>
#include <utility>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Simulator {

/// Transfers that are done and whose clients are to be told once no lock is held any more. The list runs
/// through the transfers themselves, so that completing never needs memory.
class Completions final {
  public:
    /// `inProgress` counts the transfers that were added and whose clients have not returned yet.
    explicit Completions(std::atomic<int>& inProgress) : count_(inProgress) {}
    Completions(const Completions&) = delete;
    Completions& operator=(const Completions&) = delete;

    void Add(Platform::Usb::Transfer& transfer, Platform::Usb::TransferStatus status,
             std::uint32_t actualLength) {
        ++count_;
        transfer.status = status;
        transfer.actualLength = actualLength;
        transfer.deviceData = nullptr;
        (last_ ? last_->deviceData : first_) = &transfer;
        last_ = &transfer;
    }

    void Deliver() noexcept {
        last_ = nullptr;
        while (first_) {
            auto& transfer = *static_cast<Platform::Usb::Transfer*>(first_);
            first_ = std::exchange(transfer.deviceData, nullptr);
            transfer.client->TransferCompleted(transfer);
            --count_;
        }
    }

  private:
    std::atomic<int>& count_;
    void* first_ = nullptr;
    Platform::Usb::Transfer* last_ = nullptr;
};

}  // namespace Varnholt::Simulator
