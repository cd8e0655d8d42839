#include "Capture/InterceptingDevice.h"

#include <algorithm>
#include <new>

namespace Varnholt::Capture {

using Platform::ErrorCode;
using Usb::TransferStatus;
using State = InterceptedTransfer::State;
namespace Errors = Platform::Errors;

ErrorCode InterceptingDevice::Submit(Usb::Transfer& transfer) try {
    const CopyPointer copy = NewCopy();
    static_cast<Usb::Transfer&>(*copy) = transfer;
    copy->client = this;
    copy->deviceData = nullptr;
    copy->original = &transfer;
    {
        const std::lock_guard lock(mutex_);
        copy->id = ++lastId_;
        running_[&transfer] = copy;
    }
    ErrorCode code = Errors::Success;
    try {
        code = Start(copy);
    } catch (const std::bad_alloc&) {
        code = Errors::NotEnoughMemory;
    }
    if (code != Errors::Success && !Take(*copy)) {
        return Errors::Success;  // cancelled meanwhile
    }
    return code;
} catch (const std::bad_alloc&) {
    return Errors::NotEnoughMemory;
}

ErrorCode InterceptingDevice::PassOn(const CopyPointer& copy) {
    {
        const std::lock_guard lock(mutex_);
        const bool ends = copy->state == State::Held && copy->cancelWanted;
        if (Find(*copy) == running_.end() || ends) {
            return Errors::Success;  // cancelled while it was held
        }
        copy->state = State::Submitting;
    }
    if (const ErrorCode code = device_->Submit(*copy); code != Errors::Success) {
        return code;
    }
    {
        const std::lock_guard lock(mutex_);
        if (copy->state != State::Submitting) {
            return Errors::Success;
        }
        copy->state = State::InDevice;
        if (!copy->cancelWanted) {
            return Errors::Success;
        }
    }
    device_->Cancel(*copy);
    return Errors::Success;
}

void InterceptingDevice::Cancel(Usb::Transfer& transfer) {
    EndFirst([&transfer](const auto& underWay) { return underWay.first == &transfer; },
             TransferStatus::Cancelled);
}

void InterceptingDevice::EndAll(TransferStatus status, const InterceptedTransfer* except) {
    const auto goesOn = [except](const auto& underWay) {
        return !underWay.second->cancelWanted && underWay.second.get() != except;
    };
    while (EndFirst(goesOn, status)) {  // one at a time: this takes no memory
    }
}

template <class Picks>
bool InterceptingDevice::EndFirst(Picks picks, TransferStatus status) {
    CopyPointer copy;
    State state{};
    {
        const std::lock_guard lock(mutex_);
        const auto found = std::ranges::find_if(running_, picks);
        if (found == running_.end()) {
            return false;
        }
        copy = found->second;
        copy->cancelWanted = true;
        state = copy->state;
    }
    switch (state) {
        case State::Submitting:
            break;  // whoever submits it looks at `cancelWanted` afterwards
        case State::InDevice:
            device_->Cancel(*copy);
            break;
        case State::Held:
            End(*copy, status, 0);
            break;
        case State::HeldWithData:
            End(*copy, status, status == TransferStatus::Cancelled ? copy->actualLength : 0);
            break;
    }
    return true;
}

void InterceptingDevice::TransferCompleted(Usb::Transfer& transfer) noexcept {
    auto& copy = static_cast<InterceptedTransfer&>(transfer);
    {
        const std::lock_guard lock(mutex_);
        copy.state = State::InDevice;
    }
    Completed(copy);
}

bool InterceptingDevice::HoldBack(InterceptedTransfer& copy, State state) {
    const std::lock_guard lock(mutex_);
    if (copy.cancelWanted) {
        return false;
    }
    copy.state = state;
    return true;
}

bool InterceptingDevice::IsUnderWay(const InterceptedTransfer& copy) {
    const std::lock_guard lock(mutex_);
    return Find(copy) != running_.end();
}

InterceptingDevice::UnderWay::iterator InterceptingDevice::Find(const InterceptedTransfer& copy) {
    const auto found = running_.find(copy.original);
    return found != running_.end() && found->second.get() == &copy ? found : running_.end();
}

InterceptingDevice::CopyPointer InterceptingDevice::Take(const InterceptedTransfer& copy) {
    const std::lock_guard lock(mutex_);
    const auto found = Find(copy);
    if (found == running_.end()) {
        return nullptr;
    }
    CopyPointer taken = std::move(found->second);
    running_.erase(found);
    return taken;
}

void InterceptingDevice::End(const InterceptedTransfer& copy, TransferStatus status,
                             std::uint32_t actualLength) {
    // Keeps the copy alive for the device that is completing it.
    const CopyPointer taken = Take(copy);
    if (!taken) {
        return;
    }
    Usb::Transfer& original = *taken->original;
    original.status = status;
    original.actualLength = actualLength;
    original.client->TransferCompleted(original);
}

void InterceptingDevice::Detach() {
    EndAll(TransferStatus::Cancelled);
    device_.reset();  // returns when what it still had has completed
}

}  // namespace Varnholt::Capture
