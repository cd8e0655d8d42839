#include "Utilities/Exceptions/Cause.h"

#include "Utilities/Exceptions/TraceableException.h"
#include "Utilities/Tools/TypeName.h"

namespace Varnholt::Utilities::Exceptions {

Cause::Cause(const std::exception& snapshotOf)
    : type(&typeid(snapshotOf)), message(snapshotOf.what()), isEmpty(false) {
    if (const auto* traceable = dynamic_cast<const TraceableException*>(&snapshotOf)) {
        trace = traceable->GetTrace();
    }
}

void Cause::Print(std::ostream& stream) const {
    if (isEmpty) {
        return;
    }
    stream << "\ncaused by: " << Tools::ReadableName(*type) << ": " << message << "\n";
    for (const std::string& entry : trace) {
        if (!entry.empty()) {
            stream << "\t" << entry << "\n";
        }
    }
}

}  // namespace Varnholt::Utilities::Exceptions
