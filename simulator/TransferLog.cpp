#include "TransferLog.h"

#include <utility>

#include "Capture/DescribeRequest.h"
#include "Capture/InterceptingDevice.h"
#include "TransferRecorder.h"

namespace Varnholt::Simulator {

using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;

namespace {

std::string Describe(const Transfer& transfer) {
    if (transfer.endpoint != 0) {
        return Capture::DescribeData(transfer.endpoint, transfer.actualLength, transfer.length);
    }
    if (transfer.setup.IsVendor()) {
        return Capture::DescribeRequest(
            transfer.setup.request, transfer.setup.value,
            {transfer.data, transfer.IsIn() ? transfer.actualLength : transfer.length});
    }
    return "standard request " + std::to_string(transfer.setup.request) + " value " +
           std::to_string(transfer.setup.value) + " index " + std::to_string(transfer.setup.index);
}

class LoggedDevice final : public Capture::InterceptingDevice {
  public:
    LoggedDevice(std::shared_ptr<UsbDevice> behind, Log tell)
        : InterceptingDevice(std::move(behind)), log_(std::move(tell)) {}
    ~LoggedDevice() override { Detach(); }

  private:
    Platform::ErrorCode Start(const CopyPointer& copy) override {
        const Platform::ErrorCode code = PassOn(copy);
        if (code != Platform::Errors::Success) {
            log_(Describe(*copy) + ": refused with code " + std::to_string(code));
        }
        return code;
    }
    void Completed(Capture::InterceptedTransfer& copy) noexcept override {
        std::string line = Describe(copy);
        if (copy.status != TransferStatus::Completed) {
            line += ": " + ToText(copy.status);
        }
        log_(line);
        InterceptingDevice::Completed(copy);
    }

    const Log log_;
};

}  // namespace

std::shared_ptr<UsbDevice> LogTransfers(std::shared_ptr<UsbDevice> device, Log log) {
    return std::make_shared<LoggedDevice>(std::move(device), std::move(log));
}

}  // namespace Varnholt::Simulator
