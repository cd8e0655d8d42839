// One opening of the simulated instrument.
#include "Descriptors.h"
#include "SimulatedInstrument.h"

namespace Varnholt::Simulator {

class SimulatedInstrument::Connection final : public Platform::Usb::UsbDevice {
  public:
    explicit Connection(std::shared_ptr<SimulatedInstrument> connected)
        : instrument_(std::move(connected)), attachment_{instrument_->Plugging()} {}
    ~Connection() override { instrument_->Drop(attachment_); }

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        error = Platform::Errors::Success;
        return {Simulator::Endpoints.begin(), Simulator::Endpoints.end()};
    }
    Platform::ErrorCode Claim() override { return instrument_->Claim(attachment_); }
    void Release() override { instrument_->Release(attachment_); }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        return instrument_->Submit(attachment_, transfer);
    }
    void Cancel(Platform::Usb::Transfer& transfer) override { instrument_->Cancel(transfer); }
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override {
        return instrument_->ClearHalt(attachment_, endpoint);
    }

  private:
    const std::shared_ptr<SimulatedInstrument> instrument_;
    const Attachment attachment_;
};

std::shared_ptr<Platform::Usb::UsbDevice> SimulatedInstrument::Connect(
    std::shared_ptr<SimulatedInstrument> instrument) {
    return std::make_shared<Connection>(std::move(instrument));
}

std::uint64_t SimulatedInstrument::Plugging() const {
    const std::lock_guard lock(mutex_);
    return plugging_;
}

}  // namespace Varnholt::Simulator
