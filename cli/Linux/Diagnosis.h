#pragma once

#include <string>
#include <vector>

#include "ExitCode.h"
#include "Session.h"

namespace Varnholt::Cli {

/// One thing that was looked at.
struct Finding {
    enum class Level { Good, Note, Problem };
    Level level;
    std::string subject;  ///< the device or simulator; empty: the machine
    std::string text;
    std::string fix;  ///< what to do; empty when nothing is to be done
    ExitCode code = ExitCode::Success;
};

/// Looks at everything that could be an instrument, and opens (and thereby resets) those that are free.
std::vector<Finding> Diagnose(Session& session);

}  // namespace Varnholt::Cli
