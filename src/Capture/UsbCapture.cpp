#include "Capture/UsbCapture.h"

#include <algorithm>

#include "Capture/DescribeRequest.h"
#include "Capture/InterceptingDevice.h"

namespace Varnholt::Capture {
namespace {

std::string Comment(const Usb::Transfer& transfer, bool completion) {
    if (transfer.endpoint != 0 || !transfer.setup.IsVendor()) {
        return {};
    }
    const bool dataKnown = completion || !transfer.IsIn();
    const std::uint32_t length = completion ? transfer.actualLength : transfer.length;
    return DescribeRequest(transfer.setup.request, transfer.setup.value,
                           {transfer.data, dataKnown ? length : 0});
}

class CapturedDevice final : public InterceptingDevice {
  public:
    CapturedDevice(std::shared_ptr<Usb::UsbDevice> recordedDevice, PcapngWriter& recorder,
                   std::uint8_t number)
        : InterceptingDevice(std::move(recordedDevice)), writer_(recorder), deviceNumber_(number) {}
    ~CapturedDevice() override { Detach(); }

  private:
    Platform::ErrorCode Start(const CopyPointer& copy) override {
        writer_.Write({copy->id, false, deviceNumber_, copy.get(), Comment(*copy, false)});
        const Platform::ErrorCode code = PassOn(copy);
        if (code != Platform::Errors::Success) {
            copy->status = code == Platform::Errors::DeviceNotConnected ? Usb::TransferStatus::DeviceGone
                                                                        : Usb::TransferStatus::IoError;
            copy->actualLength = 0;
            WriteCompletion(*copy);
        }
        return code;
    }
    void Completed(InterceptedTransfer& copy) noexcept override {
        WriteCompletion(copy);
        InterceptingDevice::Completed(copy);
    }
    void WriteCompletion(const InterceptedTransfer& copy) noexcept try {
        writer_.Write({copy.id, true, deviceNumber_, &copy, Comment(copy, true)});
    } catch (...) {  // no memory for the packet: the traffic goes on unrecorded
    }

    PcapngWriter& writer_;
    const std::uint8_t deviceNumber_;
};

}  // namespace

std::shared_ptr<Usb::UsbDevice> CaptureDevice(std::shared_ptr<Usb::UsbDevice> device, PcapngWriter& writer,
                                              std::uint8_t deviceNumber) {
    return std::make_shared<CapturedDevice>(std::move(device), writer, deviceNumber);
}

std::shared_ptr<Usb::UsbDevice> CapturingBus::Open(const std::string& name, Platform::ErrorCode& error) {
    constexpr std::uint8_t highestDeviceNumber = 127;
    std::shared_ptr<Usb::UsbDevice> device = bus_.Open(name, error);
    if (!device || writer_ == nullptr) {
        return device;
    }
    const auto known = std::ranges::find(names_, name);
    const auto number = static_cast<std::size_t>(known - names_.begin()) + 1;
    if (known == names_.end()) {
        names_.push_back(name);
    }
    return CaptureDevice(std::move(device), *writer_,
                         static_cast<std::uint8_t>(std::min<std::size_t>(number, highestDeviceNumber)));
}

}  // namespace Varnholt::Capture
