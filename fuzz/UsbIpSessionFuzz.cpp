// The USB/IP server's side of a connection: any bytes from the peer.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <span>

#include "PollLoop.h"
#include "SimulatedInstrument.h"
#include "UsbIpSession.h"

namespace {

using namespace Varnholt;
using namespace Varnholt::Simulator;
namespace UsbIp = Platform::Usb::UsbIp;

class OneInstrument final : public UsbIpExports {
  public:
    explicit OneInstrument(std::shared_ptr<SimulatedInstrument> exported)
        : instrument_(std::move(exported)) {}

    std::vector<UsbIp::DeviceRecord> List() override { return {Record()}; }
    Import ImportDevice(const std::string&) override {
        auto device = SimulatedInstrument::Connect(instrument_);
        if (device->Claim() != Platform::Errors::Success) {
            return {UsbIp::OperationStatus::Busy, {}, nullptr};
        }
        return {UsbIp::OperationStatus::Ok, Record(), std::move(device)};
    }

  private:
    static UsbIp::DeviceRecord Record() {
        UsbIp::DeviceRecord record;
        record.busId = "1-1";
        record.interfaces = 1;
        return record;
    }
    const std::shared_ptr<SimulatedInstrument> instrument_;
};

}  // namespace

/// The first byte says where the session begins and in what pieces the bytes arrive.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0) {
        return 0;
    }
    PollLoop loop;
    InstrumentSettings settings;
    settings.scanBytes = 100000;
    const auto instrument = std::make_shared<SimulatedInstrument>(loop, settings);
    OneInstrument exports(instrument);
    const std::uint8_t choice = data[0];
    std::span<const std::uint8_t> rest(data + 1, size - 1);
    auto session = choice % 2 == 0
                       ? std::make_unique<UsbIpSession>(exports, [] {})
                       : std::make_unique<UsbIpSession>(SimulatedInstrument::Connect(instrument), [] {});
    const std::size_t piece = 1 + choice / 2;
    while (!rest.empty() && !session->Over()) {
        const std::size_t taken = session->Receive(rest.first(std::min(piece, rest.size())));
        rest = rest.subspan(taken);
        session->OutputSent(session->Output().size());
    }
    session.reset();
    if (instrument->PendingTransfers() != 0 || instrument->Claimed()) {
        std::abort();
    }
    return 0;
}
