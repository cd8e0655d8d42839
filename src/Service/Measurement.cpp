#include "Service/Measurement.h"

#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/RamAccess.h"

namespace Varnholt::Service {
namespace {

using Commands = OpenedInstrument::Commands;
using DeviceDriver::Generic::Configuration::Property;
namespace Ids = Protocol::PropertyIds;
namespace Fixed = Interface::FixedReadout;

/// With the fixed parameters but for the time.
void SetIntegrationTime(const Commands& commands, double seconds) {
    RamAccess ram(commands);
    auto set = ram.Load();
    set.SetProperty(Ids::IntegrationTime, Property(static_cast<float>(seconds)));
    set.SetProperty(Ids::SecondTime, Property(0.0F));
    set.SetProperty(Ids::ThirdParameter, Property(std::int32_t{Fixed::P3}));
    for (int bit = 0; const std::uint16_t id : {Ids::FlagBit0, Ids::FlagBit1, Ids::FlagBit2, Ids::FlagBit3}) {
        set.SetProperty(id, Property(std::int32_t{Fixed::P4 >> bit++ & 1}));
    }
    ram.Store(set);
}

}  // namespace

void PrepareMeasurement(OpenedInstrument& instrument, const MeasurementSettings& settings) {
    instrument.UsedContext().Sleep(Fixed::WaitAfterOpening);
    SetMeasurement(instrument, settings);
}

void SetMeasurement(OpenedInstrument& instrument, const MeasurementSettings& settings) {
    instrument.Do([&settings](const Commands& commands) {
        if (settings.integrationTime > 0) {
            SetIntegrationTime(commands, settings.integrationTime);
        } else {
            const MeasurementParameters& sent = settings.parameters;
            commands->SetMeasureParameters(sent.p1, sent.p2, sent.p3, sent.p4);
        }
    });
}

MeasurementFacts FactsOf(OpenedInstrument& instrument, const MeasurementSettings& settings) {
    return instrument.Do([&settings](const Commands& commands) {
        MeasurementFacts facts{settings.parameters, 0};
        MeasurementParameters& p = facts.parameters;
        if (settings.integrationTime > 0) {
            std::uint8_t p5 = 0;
            commands->GetMeasureParameters(p.p1, p.p2, p.p3, p.p4, p5);
        }
        facts.integrationTime = p.p1 * RamAccess(commands).TimeUnit();
        return facts;
    });
}

RawReadout TakeReadout(OpenedInstrument& instrument) {
    return instrument.Do([](const Commands& commands) {
        RawReadout readout{Platform::WallClockNow(), {}};
        commands->MeasureRequest(readout.bytes.data(), Protocol::ReadoutBytes, Fixed::Timeout);
        return readout;
    });
}

}  // namespace Varnholt::Service
