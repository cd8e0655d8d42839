#pragma once

#include <algorithm>
#include <string>

#include "FaultPlan.h"

namespace Varnholt::Tests {

/// A fault as fault plans are written.
inline std::string FaultText(const Simulator::Fault& fault) {
    std::string text;
    if (fault.endpoint) {
        text = std::string(Protocol::EndpointNames[Protocol::PlaceOfEndpoint(*fault.endpoint)].name) + " ";
    }
    text += std::to_string(fault.index) + (fault.fromThenOn ? "+:" : ":");
    text += std::ranges::find(Simulator::AllFaults(), fault.kind, &Simulator::FaultName::kind)->name;
    return fault.argument ? text + "=" + std::to_string(*fault.argument) : text;
}

}  // namespace Varnholt::Tests
