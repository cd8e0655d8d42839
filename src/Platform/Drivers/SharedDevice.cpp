#include "Platform/Drivers/SharedDevice.h"

#include <algorithm>
#include <mutex>
#include <new>
#include <utility>

namespace Varnholt::Platform::Drivers {
namespace {

constexpr unsigned InDirection = 0x80;
constexpr unsigned EndpointsOfADirection = 16;

std::uint32_t BitOf(std::uint8_t endpoint) {
    const unsigned direction = (endpoint & InDirection) != 0 ? EndpointsOfADirection : 0;
    return 1U << (endpoint % EndpointsOfADirection + direction);
}

}  // namespace

SharedDevice::SharedDevice(Usb::UsbBus& usbBus, std::string nameOnBus, Abort abort)
    : bus_(usbBus), name_(std::move(nameOnBus)), abort_(std::move(abort)) {}

ErrorCode SharedDevice::Claim() {
    const std::lock_guard holder(setup_);
    if (claims_ == 0) {
        if (!opened_) {
            ErrorCode error = Errors::Success;
            opened_ = bus_.Open(name_, error);
            if (!opened_) {
                return Note(error != Errors::Success ? error : Errors::GeneralFailure);
            }
            usb_.store(opened_.get(), std::memory_order_release);
        }
        const ErrorCode code = Note(opened_->Claim());
        if (code != Errors::Success) {
            return code;
        }
    }
    ++claims_;
    return Errors::Success;
}

void SharedDevice::Unclaim() {
    const std::lock_guard holder(setup_);
    if (claims_ > 0 && --claims_ == 0) {
        ClearHalts();
        opened_->Release();
    }
}

bool SharedDevice::IsClaimed() {
    const std::lock_guard holder(setup_);
    return claims_ > 0;
}

ErrorCode SharedDevice::FindEndpoint(std::uint8_t endpoint, ErrorCode absent) {
    const std::lock_guard holder(setup_);
    ErrorCode error = Errors::Success;
    const auto endpoints = opened_->Endpoints(error);
    if (error != Errors::Success) {
        return Note(error);
    }
    const auto found = std::ranges::find(endpoints, endpoint, &Usb::EndpointInfo::address);
    return found != endpoints.end() ? Errors::Success : absent;
}

ErrorCode SharedDevice::Submit(Usb::Transfer& transfer) try {
    if ((halted_.load(std::memory_order_acquire) & BitOf(transfer.endpoint)) != 0) {
        const ErrorCode code = ClearHalt(transfer.endpoint);
        if (code != Errors::Success) {
            return code;
        }
    }
    return Note(usb_.load(std::memory_order_acquire)->Submit(transfer));
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

void SharedDevice::Cancel(Usb::Transfer& transfer) {
    usb_.load(std::memory_order_acquire)->Cancel(transfer);
}

std::shared_ptr<CompletionSource> SharedDevice::CompletionsOf(std::uint8_t endpoint) {
    return usb_.load(std::memory_order_acquire)->CompletionsOf(endpoint);
}

void SharedDevice::Learn(const Usb::Transfer& transfer) {
    if (transfer.status == Usb::TransferStatus::Stalled && transfer.endpoint != 0) {
        halted_.fetch_or(BitOf(transfer.endpoint), std::memory_order_release);
    } else if (transfer.status == Usb::TransferStatus::DeviceGone) {
        gone_.store(true, std::memory_order_relaxed);
    }
}

ErrorCode SharedDevice::ClearHalt(std::uint8_t endpoint) {
    // Whoever comes second must not pass before the first has cleared the halt, or its transfer stalls again.
    const std::lock_guard holder(setup_);
    if ((halted_.load(std::memory_order_acquire) & BitOf(endpoint)) == 0) {
        return Errors::Success;
    }
    const ErrorCode code = Note(opened_->ClearHalt(endpoint));
    if (code == Errors::Success) {
        halted_.fetch_and(~BitOf(endpoint), std::memory_order_release);
    }
    return code;
}

/// A halt outlives the claim, and whoever comes next knows nothing of it. A device that does not take this
/// cannot be helped.
void SharedDevice::ClearHalts() noexcept try {
    for (unsigned number = 1; number < EndpointsOfADirection; ++number) {
        for (const unsigned direction : {0U, InDirection}) {
            if (!IsGone()) {
                ClearHalt(static_cast<std::uint8_t>(number | direction));
            }
        }
    }
} catch (...) {
}

ErrorCode SharedDevice::Note(ErrorCode code) {
    if (code == Errors::DeviceNotConnected) {
        gone_.store(true, std::memory_order_relaxed);
    }
    return code;
}

}  // namespace Varnholt::Platform::Drivers
