#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <ranges>
#include <utility>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"
#include "Support/Bytes.h"

namespace Varnholt::Tests {

using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;

/// A USB device that does what a test says. Without instructions each transfer is pending until it is ended
/// or cancelled. The members that are no functions are for the test's own thread.
class HookedDevice final : public Platform::Usb::UsbDevice {
  public:
    using ErrorCode = Platform::ErrorCode;

    std::function<ErrorCode(Transfer&)> onSubmit;
    std::function<void(Transfer&)> onCancel = [](Transfer& transfer) {
        Complete(transfer, TransferStatus::Cancelled, 0);
    };
    std::function<void()> onClose = [] {};
    ErrorCode claimAnswer = 0, endpointsAnswer = 0, haltAnswer = 0;
    bool isClaimed = false;
    int opened = 0, handles = 0, claims = 0, submissions = 0, cancellations = 0;
    Bytes clearedHalts;  ///< endpoints
    Transfer last;       ///< as it was submitted
    Bytes sent;          ///< by it

    static void Complete(Transfer& transfer, TransferStatus status, std::uint32_t moved) {
        transfer.status = status;
        transfer.actualLength = moved;
        transfer.client->TransferCompleted(transfer);
    }
    /// From now on transfers end inside `Submit`. What comes in are the bytes 0, 1, 2...
    void AnswerAtOnce(TransferStatus status = TransferStatus::Completed, std::uint32_t most = 0xFFFFFFFF) {
        onSubmit = [status, most](Transfer& transfer) {
            const std::uint32_t moved = std::min(most, transfer.length);
            if (transfer.IsIn()) {
                std::iota(transfer.data, transfer.data + moved, std::uint8_t{0});
            }
            Complete(transfer, status, moved);
            return Platform::Errors::Success;
        };
    }
    /// Ends the oldest pending transfer of an endpoint with `data`.
    void Send(std::uint8_t endpoint, const Bytes& data) {
        if (Transfer* const transfer = Take(endpoint)) {
            std::ranges::copy(data, transfer->data);
            Complete(*transfer, TransferStatus::Completed, static_cast<std::uint32_t>(data.size()));
        } else {
            ADD_FAILURE() << "nobody waits for data of endpoint " << int{endpoint};
        }
    }

    std::vector<Platform::Usb::EndpointInfo> Endpoints(ErrorCode& error) override {
        error = endpointsAnswer;
        return error != 0 ? std::vector<Platform::Usb::EndpointInfo>()
                          : std::vector<Platform::Usb::EndpointInfo>{{Protocol::BulkOutEndpoint, 2, 512},
                                                                     {Protocol::BulkInEndpoint, 2, 512},
                                                                     {Protocol::InterruptInEndpoint, 3, 8}};
    }
    ErrorCode Claim() override {
        isClaimed = claimAnswer == Platform::Errors::Success;
        claims += isClaimed ? 1 : 0;
        return claimAnswer;
    }
    void Release() override { isClaimed = false; }
    ErrorCode Submit(Transfer& transfer) override {
        {
            const std::lock_guard lock(mutex_);
            ++submissions;
            last = transfer;
            sent.assign(transfer.data, transfer.data + (transfer.IsIn() ? 0 : transfer.length));
            if (!onSubmit) {
                pending_.push_back(&transfer);
            }
        }
        return onSubmit ? onSubmit(transfer) : Platform::Errors::Success;
    }
    void Cancel(Transfer& transfer) override {
        {
            const std::lock_guard lock(mutex_);
            if (std::erase(pending_, &transfer) == 0 && !onSubmit) {
                return;  // has ended meanwhile
            }
            ++cancellations;
        }
        onCancel(transfer);
    }
    ErrorCode ClearHalt(std::uint8_t endpoint) override {
        clearedHalts.push_back(endpoint);
        return haltAnswer;
    }

  private:
    Transfer* Take(std::uint8_t endpoint) {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find(pending_, endpoint, &Transfer::endpoint);
        Transfer* const transfer = found != pending_.end() ? *found : nullptr;
        std::erase(pending_, transfer);
        return transfer;
    }

    std::mutex mutex_;  // guards what is pending, and what a submission and a cancellation write down
    std::deque<Transfer*> pending_;
};

/// A bus with such devices, in the order in which they were plugged in.
class HookedBus final : public Platform::Usb::UsbBus {
  public:
    std::vector<std::pair<std::string, std::shared_ptr<HookedDevice>>> devices;
    Platform::ErrorCode openAnswer = Platform::Errors::Success;

    std::vector<std::string> List() override {
        const auto names = std::views::keys(devices);
        return {names.begin(), names.end()};
    }
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string& name,
                                                   Platform::ErrorCode& error) override {
        error = openAnswer;
        if (error != Platform::Errors::Success) {
            return nullptr;
        }
        const auto device =
            std::ranges::find(devices, name, [](const auto& each) { return each.first; })->second;
        ++device->opened;
        ++device->handles;
        return {device.get(), [device](HookedDevice*) {
                    --device->handles;
                    device->isClaimed = false;
                    std::exchange(device->onClose, [] {})();
                }};
    }
};

}  // namespace Varnholt::Tests
