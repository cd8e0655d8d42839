#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Service/Context.h"

namespace Varnholt::Service {

/// One thing that the doctor looked at.
struct Finding {
    enum class Level { Good, Note, Problem };
    Level level;
    std::string subject;  ///< the device or simulator; empty: the machine
    std::string text;
    std::string fix;                       ///< what to do; empty when nothing is to be done
    std::optional<FailureKind> failure{};  ///< that it would be for who uses the device
};

/// What came of opening an instrument and asking it something.
struct Answer {
    std::uint16_t firmware = 0;
    std::optional<Failure> failure{};
};
/// Opens the instrument with this name, identifier or short name.
using Trial = std::function<Answer(const std::string& name)>;

Answer TryInstrument(Context& context, const std::string& identifier);
Finding JudgeAnswer(const std::string& subject, const Answer& answer);

/// Looks at everything that could be an instrument, with the means of this platform, and opens (and thereby
/// resets) those that are free.
std::vector<Finding> Diagnose(Context& context);
/// The same where kernel drivers stand between the library and the instruments: looks at the interfaces of
/// both drivers. Takes up to 8 seconds for an instrument whose lock another process keeps.
std::vector<Finding> DiagnoseDrivers(Context& context);

}  // namespace Varnholt::Service
