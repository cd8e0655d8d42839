#include "Utilities/Exceptions/Cause.h"

#include "Utilities/Exceptions/TraceableException.h"
#include "Utilities/Tools/TypeName.h"

namespace Varnholt::Utilities::Exceptions {

Cause::Cause(const std::exception& snapshotOf)
    : type_(&typeid(snapshotOf)), message_(snapshotOf.what()), isEmpty_(false) {
    if (const auto* traceable = dynamic_cast<const TraceableException*>(&snapshotOf)) {
        trace_ = traceable->GetTrace();
    }
}

void Cause::Print(std::ostream& stream) const {
    if (isEmpty_) {
        return;
    }
    stream << "\ncaused by: " << Tools::ReadableName(*type_) << ": " << message_ << "\n";
    for (const std::string& entry : trace_) {
        if (!entry.empty()) {
            stream << "\t" << entry << "\n";
        }
    }
}

}  // namespace Varnholt::Utilities::Exceptions
