#include "Capture/InterceptingDevice.h"

namespace Varnholt::Capture {

Platform::ErrorCode InterceptingDevice::Submit(Usb::Transfer& transfer) {
    const auto copy = std::make_shared<Copy>();
    static_cast<Usb::Transfer&>(*copy) = transfer;
    copy->client = this;
    copy->deviceData = nullptr;
    copy->original = &transfer;
    {
        const std::lock_guard lock(mutex_);
        copy->id = ++lastId_;
        running_[&transfer] = copy;
    }
    const std::uint64_t id = copy->id;
    Platform::ErrorCode code = Platform::Errors::Success;
    try {
        BeforeSubmit(id, *copy);
        code = device_->Submit(*copy);
    } catch (...) {
        Take(transfer);
        throw;
    }
    if (code != Platform::Errors::Success) {
        Take(transfer);
        Refused(id, *copy, code);
    }
    return code;
}

void InterceptingDevice::Cancel(Usb::Transfer& transfer) {
    std::shared_ptr<Copy> copy;
    {
        const std::lock_guard lock(mutex_);
        if (const auto found = running_.find(&transfer); found != running_.end()) {
            copy = found->second;
        }
    }
    if (copy) {
        device_->Cancel(*copy);
    }
}

std::shared_ptr<InterceptingDevice::Copy> InterceptingDevice::Take(Usb::Transfer& original) {
    const std::lock_guard lock(mutex_);
    const auto found = running_.find(&original);
    std::shared_ptr<Copy> copy = std::move(found->second);
    running_.erase(found);
    return copy;
}

void InterceptingDevice::TransferCompleted(Usb::Transfer& transfer) noexcept {
    Usb::Transfer& original = *static_cast<Copy&>(transfer).original;
    const std::shared_ptr<Copy> copy = Take(original);
    AfterCompletion(copy->id, *copy);
    original.status = copy->status;
    original.actualLength = copy->actualLength;
    original.client->TransferCompleted(original);
}

}  // namespace Varnholt::Capture
