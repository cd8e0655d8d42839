#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "ExitCode.h"
#include "Failure.h"

namespace Varnholt::Cli {

class Session;

/// One thing that the doctor looked at.
struct Finding {
    enum class Level { Good, Note, Problem };
    Level level;
    std::string subject;  ///< the device or simulator; empty: the machine
    std::string text;
    std::string fix;  ///< what to do; empty when nothing is to be done
    ExitCode code = ExitCode::Success;
};

/// What came of opening an instrument and asking it something.
struct Answer {
    std::uint16_t firmware = 0;
    std::optional<FailureReport> failure;
};
/// Opens the instrument with this name, identifier or short name.
using Trial = std::function<Answer(const std::string& name)>;

Answer TryInstrument(Session& session, const std::string& identifier);
Finding JudgeAnswer(const std::string& subject, const Answer& answer);

/// Looks at everything that could be an instrument, with the means of this platform, and opens (and thereby
/// resets) those that are free.
std::vector<Finding> Diagnose(Session& session);

}  // namespace Varnholt::Cli
