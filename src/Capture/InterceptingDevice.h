#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Capture {

namespace Usb = Platform::Usb;

/// What the device behind works on in place of the submitter's own transfer.
struct InterceptedTransfer : Usb::Transfer {
    enum class State {
        Submitting,    ///< being handed to the device
        InDevice,      ///< accepted by the device
        Held,          ///< not with the device
        HeldWithData,  ///< done by the device, not yet the submitter's
    };

    std::uint64_t id = 0;  ///< counts up from 1
    Usb::Transfer* original = nullptr;
    State state = State::Submitting;  ///< this and the next: the intercepting device's own
    bool cancelWanted = false;
};

/// Base of devices that stand in front of another and look at, or change, every transfer: recorders and fault
/// injectors. Each transfer is submitted as a copy; what the copy comes back with reaches the submitter's
/// own. A derived class calls `Detach` first in its destructor.
class InterceptingDevice : public Usb::UsbDevice, private Usb::TransferClient {
  public:
    std::vector<Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        return device_->Endpoints(error);
    }
    Platform::ErrorCode Claim() override { return device_->Claim(); }
    void Release() override { device_->Release(); }
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override { return device_->ClearHalt(endpoint); }
    std::shared_ptr<Platform::CompletionSource> CompletionsOf(std::uint8_t endpoint) override {
        return device_->CompletionsOf(endpoint);
    }
    Platform::ErrorCode Submit(Usb::Transfer& transfer) final;
    void Cancel(Usb::Transfer& transfer) final;

  protected:
    using CopyPointer = std::shared_ptr<InterceptedTransfer>;

    explicit InterceptingDevice(std::shared_ptr<Usb::UsbDevice> behind) : device_(std::move(behind)) {}

    virtual CopyPointer NewCopy() { return std::make_shared<InterceptedTransfer>(); }
    /// What to do with a submitted copy: pass it on at once, or end or pass it on later. With any code but
    /// `Success` the transfer is not accepted. It may have been cancelled, and so have ended, meanwhile.
    virtual Platform::ErrorCode Start(const CopyPointer& copy) { return PassOn(copy); }
    /// The device has done with the copy, whose outcome may be changed: ends it, or holds it back.
    virtual void Completed(InterceptedTransfer& copy) noexcept { End(copy, copy.status, copy.actualLength); }

    /// Submits a copy to the device unless it has ended. With any code but `Success` the caller has to end
    /// it.
    Platform::ErrorCode PassOn(const CopyPointer& copy);
    /// Keeps a copy, `Held` or `HeldWithData`, until it is cancelled, ended or passed on; false, and nothing
    /// changed, when its end was asked for already.
    bool HoldBack(InterceptedTransfer& copy, InterceptedTransfer::State state);
    /// Ends a transfer unless it has ended.
    void End(const InterceptedTransfer& copy, Usb::TransferStatus status, std::uint32_t actualLength);
    /// Ends what is held with `status` and has the device end the rest. `except`, which may be null, goes on.
    void EndAll(Usb::TransferStatus status, const InterceptedTransfer* except = nullptr);
    bool IsUnderWay(const InterceptedTransfer& copy);
    /// No transfer is under way, and no function of the derived class is called, when this has returned.
    void Detach();

  private:
    void TransferCompleted(Usb::Transfer& transfer) noexcept final;
    using UnderWay = std::map<const Usb::Transfer*, CopyPointer>;  // by the submitter's own

    /// Ends the first transfer under way that `picks` picks, or has the device end it; false: there is none.
    template <class Picks>
    bool EndFirst(Picks picks, Usb::TransferStatus status);
    /// With the lock held.
    UnderWay::iterator Find(const InterceptedTransfer& copy);
    /// Takes a copy out of the ones under way; null when it has ended.
    CopyPointer Take(const InterceptedTransfer& copy);

    std::shared_ptr<Usb::UsbDevice> device_;
    std::mutex
        mutex_;  // guards what follows; not held while the device, a client or a derived class is called
    UnderWay running_;
    std::uint64_t lastId_ = 0;
};

}  // namespace Varnholt::Capture
