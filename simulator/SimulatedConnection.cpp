// One opening of the simulated instrument.
#include "SimulatedInstrument.h"

namespace Varnholt::Simulator {

class SimulatedInstrument::Connection final : public Platform::Usb::UsbDevice {
  public:
    explicit Connection(std::shared_ptr<SimulatedInstrument> connected)
        : instrument(std::move(connected)), attachment{instrument->Plugging()} {}
    ~Connection() override { instrument->Drop(attachment); }

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override {
        return instrument->Endpoints(error);
    }
    Platform::ErrorCode Claim() override { return instrument->ClaimFor(attachment); }
    void Release() override { instrument->ReleaseFor(attachment); }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override {
        return instrument->SubmitFor(attachment, transfer);
    }
    void Cancel(Platform::Usb::Transfer& transfer) override { instrument->Cancel(transfer); }
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override {
        return instrument->ClearHaltFor(attachment, endpoint);
    }

  private:
    const std::shared_ptr<SimulatedInstrument> instrument;
    const Attachment attachment;
};

std::shared_ptr<Platform::Usb::UsbDevice> SimulatedInstrument::Connect(
    std::shared_ptr<SimulatedInstrument> instrument) {
    return std::make_shared<Connection>(std::move(instrument));
}

std::uint64_t SimulatedInstrument::Plugging() const {
    const std::lock_guard lock(mutex);
    return plugging;
}

}  // namespace Varnholt::Simulator
