#pragma once

#include "Service/Failure.h"

namespace Varnholt::Cli {

using Service::Failure;
using Service::FailureKind;

/// What the tool tells the shell: one number for each class of failure. Scripts rely on them; they are
/// described in docs/ostra-tool.md and in the tool's help.
enum class ExitCode : int {
    Success = 0,
    Other = 1,          ///< a failure that none of the others names
    Usage = 2,          ///< the command line cannot be understood
    NoInstrument = 3,   ///< none is connected, not the one that was named, or it was unplugged
    NotAvailable = 4,   ///< used by another process, or no permission
    InputOutput = 5,    ///< a transfer failed
    Timeout = 6,        ///< the instrument did not answer in time
    BadData = 7,        ///< data or values that cannot be used: an image, a table, an integration time
    File = 8,           ///< a file cannot be read or written
    Different = 9,      ///< the images that were compared differ
    Interrupted = 130,  ///< ended by Ctrl-C or a signal
};

ExitCode ExitCodeOf(FailureKind kind);

}  // namespace Varnholt::Cli
