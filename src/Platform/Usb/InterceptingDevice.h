#pragma once

#include <map>
#include <memory>
#include <mutex>

#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Usb {

/// Base of devices that stand in front of another and look at, or change, every transfer: recorders and fault
/// injectors. Each transfer is submitted as a copy; what the copy comes back with reaches the submitter's
/// own.
class InterceptingDevice : public UsbDevice, private TransferClient {
  public:
    std::vector<EndpointInfo> Endpoints(ErrorCode& error) override { return device_->Endpoints(error); }
    ErrorCode Claim() override { return device_->Claim(); }
    void Release() override { device_->Release(); }
    ErrorCode ClearHalt(std::uint8_t endpoint) override { return device_->ClearHalt(endpoint); }
    ErrorCode Submit(Transfer& transfer) final;
    void Cancel(Transfer& transfer) final;

  protected:
    explicit InterceptingDevice(std::shared_ptr<UsbDevice> behind) : device_(std::move(behind)) {}
    /// A derived class calls this first in its destructor: no transfer is under way, and none of the
    /// functions below is called, after it.
    void Detach() { device_.reset(); }

    /// Before the copy is submitted; may change it.
    virtual void BeforeSubmit(std::uint64_t id, Transfer& transfer) = 0;
    /// When the copy has completed, before the submitter learns of it; may change its outcome.
    virtual void AfterCompletion(std::uint64_t id, Transfer& transfer) noexcept = 0;
    /// When the device did not accept the copy.
    virtual void Refused(std::uint64_t id, Transfer& transfer, ErrorCode code) = 0;

  private:
    struct Copy : Transfer {
        std::uint64_t id = 0;
        Transfer* original = nullptr;
    };

    void TransferCompleted(Transfer& transfer) noexcept final;
    std::shared_ptr<Copy> Take(Transfer& original);

    std::shared_ptr<UsbDevice> device_;
    std::mutex mutex_;  // guards what follows; not held while the device or a client is called
    std::map<const Transfer*, std::shared_ptr<Copy>> running_;
    std::uint64_t lastId_ = 0;
};

}  // namespace Varnholt::Platform::Usb
