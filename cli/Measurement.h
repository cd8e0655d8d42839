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

/// The signed values of a record: pairs of bytes, most significant first, those above 0xF800 negative.
std::vector<std::int32_t> ValuesOf(std::span<const std::uint8_t> record);

}  // namespace Varnholt::Cli
