#pragma once

#include <array>
#include <cstdint>

#include "Interface/Readout.h"
#include "Platform/Time.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Service {

/// The measurement parameters as they are sent; at first those of the library's exported readout.
struct MeasurementParameters {
    std::uint16_t p1 = Interface::FixedReadout::P1;
    std::uint16_t p2 = Interface::FixedReadout::P2;
    std::uint16_t p3 = Interface::FixedReadout::P3;
    std::uint8_t p4 = Interface::FixedReadout::P4;
};

/// How readouts and scans are taken.
struct MeasurementSettings {
    double integrationTime = 0;  ///< seconds; 0: as the parameters say
    MeasurementParameters parameters;
};

/// Gives the instrument the time that it needs after its reset and sets its measurement parameters.
void PrepareMeasurement(OpenedInstrument& instrument, const MeasurementSettings& settings);
/// The second half of it; an integration time chooses the measurement mode as well.
void SetMeasurement(OpenedInstrument& instrument, const MeasurementSettings& settings);

/// What a measurement is taken with.
struct MeasurementFacts {
    MeasurementParameters parameters;
    double integrationTime = 0;  ///< seconds: p1 in time units of the instrument's measurement mode
};
/// Of a measurement that is prepared. Asks the instrument for its mode, and with an integration time for the
/// parameters that were made of it.
MeasurementFacts FactsOf(OpenedInstrument& instrument, const MeasurementSettings& settings);

/// A readout as the instrument sent it.
struct RawReadout {
    Platform::WallTime time;  ///< when it was begun
    std::array<std::uint8_t, Protocol::ReadoutBytes> bytes{};

    /// In sensor order.
    std::array<std::int32_t, Protocol::ReadoutValues> Values() const {
        return Interface::ReadoutFromBytes(bytes);
    }
};
/// Of a measurement that is prepared.
RawReadout TakeReadout(OpenedInstrument& instrument);

}  // namespace Varnholt::Service
