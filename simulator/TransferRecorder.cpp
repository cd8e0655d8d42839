#include "TransferRecorder.h"

#include <algorithm>
#include <array>
#include <map>
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

class TransferRecorder::Device final : public InterceptingDevice {
  public:
    Device(std::shared_ptr<UsbDevice> recorded, TransferRecorder& transferRecorder)
        : InterceptingDevice(std::move(recorded)), recorder_(transferRecorder) {}
    ~Device() override { Detach(); }

  private:
    /// Where a running transfer is written down.
    struct Place {
        std::size_t cleared;
        std::size_t index;
    };

    Platform::ErrorCode Start(const CopyPointer& copy) override {
        RecordedTransfer recorded;
        recorded.endpoint = copy->endpoint;
        recorded.setup = copy->setup;
        recorded.length = copy->length;
        if (!copy->IsIn()) {
            recorded.data.assign(copy->data, copy->data + copy->length);
        }
        {
            const std::lock_guard lock(recorder_.mutex_);
            places_[copy->id] = {recorder_.cleared_, recorder_.transfers_.size()};
            recorder_.transfers_.push_back(std::move(recorded));
        }
        const Platform::ErrorCode code = PassOn(copy);
        if (code != Platform::Errors::Success) {
            const std::lock_guard lock(recorder_.mutex_);
            if (RecordedTransfer* const refused = Find(copy->id)) {
                refused->accepted = false;
            }
            places_.erase(copy->id);
        }
        return code;
    }

    void Completed(Capture::InterceptedTransfer& copy) noexcept override {
        {
            const std::lock_guard lock(recorder_.mutex_);
            if (RecordedTransfer* const recorded = Find(copy.id)) {
                recorded->completed = true;
                recorded->status = copy.status;
                if (copy.IsIn()) {
                    recorded->data.assign(copy.data, copy.data + copy.actualLength);
                } else {
                    recorded->data.resize(std::min<std::size_t>(recorded->data.size(), copy.actualLength));
                }
            }
            places_.erase(copy.id);
        }
        InterceptingDevice::Completed(copy);
    }

    RecordedTransfer* Find(std::uint64_t id) {
        const Place place = places_.at(id);
        return place.cleared == recorder_.cleared_ ? &recorder_.transfers_[place.index] : nullptr;
    }

    TransferRecorder& recorder_;
    std::map<std::uint64_t, Place> places_;  // guarded by the recorder's lock
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
    const std::lock_guard lock(mutex_);
    return transfers_;
}

std::size_t TransferRecorder::Count() const {
    const std::lock_guard lock(mutex_);
    return transfers_.size();
}

void TransferRecorder::Clear() {
    const std::lock_guard lock(mutex_);
    transfers_.clear();
    ++cleared_;
}

}  // namespace Varnholt::Simulator
