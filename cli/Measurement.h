#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "CommandSpec.h"
#include "Instrument.h"

namespace Varnholt::Cli {

/// How readouts and scans are taken. Nothing set: with the fixed parameters of the library's exported
/// readout.
struct MeasurementOptions {
    double integrationTime = 0;  ///< seconds; 0: not set
    std::string parameters;      ///< "P1,P2,P3,P4" as they are sent; empty: not set
};

void AddMeasurementOptions(CommandSpec command, MeasurementOptions& options);

/// Gives the instrument the time that it needs after its reset and sets its measurement parameters.
void PrepareMeasurement(Session& session, Instrument& instrument, const MeasurementOptions& options);

/// What a measurement is taken with.
struct MeasurementFacts {
    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0;
    double integrationTime = 0;  ///< seconds: p1 in time units of the instrument's measurement mode
};
/// Of a measurement that is prepared. Asks the instrument for its mode, and with an integration time for the
/// parameters that were made of it.
MeasurementFacts FactsOf(Instrument& instrument, const MeasurementOptions& options);

}  // namespace Varnholt::Cli
