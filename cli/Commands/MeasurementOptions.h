#pragma once

#include "CommandSpec.h"
#include "Service/Measurement.h"

namespace Varnholt::Cli {

/// --integration-time and --parameters, which exclude each other.
struct MeasurementOptions {
    double integrationTime = 0;  ///< seconds; 0: not set
    std::string parameters;      ///< "P1,P2,P3,P4" as they are sent; empty: not set

    Service::MeasurementSettings Settings() const;
};

void AddMeasurementOptions(CommandSpec command, MeasurementOptions& options);

}  // namespace Varnholt::Cli
