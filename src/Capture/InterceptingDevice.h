#pragma once

#include <map>
#include <memory>
#include <mutex>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Capture {

namespace Usb = Platform::Usb;

/// Base of devices that stand in front of another and look at, or change, every transfer: recorders and fault
/// injectors. Each transfer is submitted as a copy; what the copy comes back with reaches the submitter's
/// own.
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
    explicit InterceptingDevice(std::shared_ptr<Usb::UsbDevice> behind) : device_(std::move(behind)) {}
    /// A derived class calls this first in its destructor: no transfer is under way, and none of the
    /// functions below is called, after it.
    void Detach() { device_.reset(); }

    /// Before the copy is submitted; may change it.
    virtual void BeforeSubmit(std::uint64_t id, Usb::Transfer& transfer) = 0;
    /// When the copy has completed, before the submitter learns of it; may change its outcome.
    virtual void AfterCompletion(std::uint64_t id, Usb::Transfer& transfer) noexcept = 0;
    /// When the device did not accept the copy.
    virtual void Refused(std::uint64_t id, Usb::Transfer& transfer, Platform::ErrorCode code) = 0;

  private:
    struct Copy : Usb::Transfer {
        std::uint64_t id = 0;
        Usb::Transfer* original = nullptr;
    };

    void TransferCompleted(Usb::Transfer& transfer) noexcept final;
    std::shared_ptr<Copy> Take(Usb::Transfer& original);

    std::shared_ptr<Usb::UsbDevice> device_;
    std::mutex mutex_;  // guards what follows; not held while the device or a client is called
    std::map<const Usb::Transfer*, std::shared_ptr<Copy>> running_;
    std::uint64_t lastId_ = 0;
};

}  // namespace Varnholt::Capture
