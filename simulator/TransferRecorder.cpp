#include "TransferRecorder.h"

#include <algorithm>
#include <array>
#include <utility>

#include "Capture/DescribeRequest.h"
#include "Capture/InterceptingDevice.h"
#include "Protocol/EndpointNames.h"

namespace Varnholt::Simulator {

using Capture::Hexadecimal;
using Capture::InterceptingDevice;
using Platform::Usb::TransferStatus;
using Platform::Usb::UsbDevice;

namespace {

std::string EndpointText(const RecordedTransfer& transfer) {
    std::string text(Protocol::EndpointNames[Protocol::PlaceOfEndpoint(transfer.endpoint)].name);
    if (transfer.endpoint == 0) {
        text += " " + Hexadecimal(transfer.setup.request, 2) + (transfer.setup.IsIn() ? " in" : " out");
    }
    return text + " ";
}

}  // namespace

std::string ToText(TransferStatus status) {
    constexpr std::array texts{"completed", "stalled", "I/O error", "overflow", "cancelled", "device gone"};
    return texts.at(static_cast<std::size_t>(status));
}

std::string RecordedTransfer::Text(std::size_t most) const {
    std::string text = EndpointText(*this) + std::to_string(length) + ":";
    for (std::size_t i = 0; i < std::min(most, data.size()); ++i) {
        text += " " + Hexadecimal(data[i], 2);
    }
    if (data.size() > most) {
        text += " ...";
    }
    if (!accepted) {
        return text + " not accepted";
    }
    if (!completed) {
        return text + " pending";
    }
    return status == TransferStatus::Completed ? text : text + " " + ToText(status);
}

/// A transfer on its way, and where it is written down: that outlives a `Clear` meanwhile.
struct TransferRecorder::Running : Capture::InterceptedTransfer {
    std::shared_ptr<RecordedTransfer> record = std::make_shared<RecordedTransfer>();
};

class TransferRecorder::Device final : public InterceptingDevice {
  public:
    Device(std::shared_ptr<UsbDevice> recorded, TransferRecorder& transferRecorder)
        : InterceptingDevice(std::move(recorded)), recorder_(transferRecorder) {}
    ~Device() override { Detach(); }

  private:
    CopyPointer NewCopy() override { return std::make_shared<Running>(); }

    Platform::ErrorCode Start(const CopyPointer& copy) override {
        RecordedTransfer& record = *static_cast<Running&>(*copy).record;
        record.endpoint = copy->endpoint;
        record.setup = copy->setup;
        record.length = copy->length;
        if (!copy->IsIn()) {
            record.data.assign(copy->data, copy->data + copy->length);
        }
        {
            const std::lock_guard lock(recorder_.mutex_);
            recorder_.transfers_.push_back(static_cast<Running&>(*copy).record);
        }
        const Platform::ErrorCode code = PassOn(copy);
        if (code != Platform::Errors::Success) {
            const std::lock_guard lock(recorder_.mutex_);
            record.accepted = false;
        }
        return code;
    }

    void Completed(Capture::InterceptedTransfer& copy) noexcept override {
        {
            const std::lock_guard lock(recorder_.mutex_);
            RecordedTransfer& record = *static_cast<Running&>(copy).record;
            record.completed = true;
            record.status = copy.status;
            if (copy.IsIn()) {
                record.data.assign(copy.data, copy.data + copy.actualLength);
            } else {
                record.data.resize(std::min<std::size_t>(record.data.size(), copy.actualLength));
            }
        }
        InterceptingDevice::Completed(copy);
    }

    TransferRecorder& recorder_;
};

std::shared_ptr<UsbDevice> TransferRecorder::Record(std::shared_ptr<UsbDevice> device) {
    return std::make_shared<Device>(std::move(device), *this);
}

std::string TransferRecorder::Text(std::size_t most) const {
    std::string text;
    for (const RecordedTransfer& transfer : Transfers()) {
        if (transfer.endpoint != Protocol::InterruptInEndpoint) {
            text += transfer.Text(most) + "\n";
        }
    }
    return text;
}

std::vector<RecordedTransfer> TransferRecorder::Transfers() const {
    std::vector<RecordedTransfer> transfers;
    const std::lock_guard lock(mutex_);
    for (const auto& transfer : transfers_) {
        transfers.push_back(*transfer);
    }
    return transfers;
}

std::size_t TransferRecorder::Count() const {
    const std::lock_guard lock(mutex_);
    return transfers_.size();
}

void TransferRecorder::Clear() {
    const std::lock_guard lock(mutex_);
    transfers_.clear();
}

}  // namespace Varnholt::Simulator
