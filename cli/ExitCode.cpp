#include "ExitCode.h"

namespace Varnholt::Cli {

ExitCode ExitCodeOf(FailureKind kind) {
    switch (kind) {
        case FailureKind::Other:
            return ExitCode::Other;
        case FailureKind::BadArgument:
            return ExitCode::Usage;
        case FailureKind::NotFound:
        case FailureKind::Unplugged:
            return ExitCode::NoInstrument;
        case FailureKind::InUse:
        case FailureKind::NoPermission:
        case FailureKind::NoLock:
            return ExitCode::NotAvailable;
        case FailureKind::TransferFailed:
        case FailureKind::ShortData:
            return ExitCode::InputOutput;
        case FailureKind::Timeout:
            return ExitCode::Timeout;
        case FailureKind::BadData:
            return ExitCode::BadData;
        case FailureKind::File:
            return ExitCode::File;
        case FailureKind::Different:
            return ExitCode::Different;
        case FailureKind::Interrupted:
            return ExitCode::Interrupted;
    }
    return ExitCode::Other;
}

}  // namespace Varnholt::Cli
