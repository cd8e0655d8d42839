#pragma once

#include <memory>
#include <string>

#include "Output/RecordOutput.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Whether `--output` asks for a file; without a name, and with "-", it is standard output.
bool GoesToFile(const std::string& output);

/// Where the records go. To be made before the instrument is opened: what cannot be written is found first.
std::unique_ptr<RecordOutput> MakeRecordOutput(Session& session, const std::string& output, bool isRaw);

/// How a measurement ended that did not come to its end.
struct EarlyEnd {
    Failure failure;   ///< says what became of the records
    std::string file;  ///< that has them; empty: none
};
/// While the failure is handled that was that end. `noun`: what is recorded, such as "record".
EarlyEnd EndEarly(const Session& session, RecordOutput& output, const std::string& noun, bool discard);

}  // namespace Varnholt::Cli
