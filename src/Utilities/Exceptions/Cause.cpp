#include "Utilities/Exceptions/Cause.h"

#include "Utilities/Exceptions/TraceableException.h"
#include "Utilities/Tools/TypeName.h"

namespace Varnholt::Utilities::Exceptions {

Cause::Cause(const std::exception& snapshotOf) : type_(&typeid(snapshotOf)), message_(snapshotOf.what()) {
    if (const auto* traceable = dynamic_cast<const TraceableException*>(&snapshotOf)) {
        trace_ = traceable->GetTrace();
    }
}

std::string Cause::Text() const {
    if (IsEmpty()) {
        return {};
    }
    std::string text = "\ncaused by: " + Tools::ReadableName(*type_) + ": " + message_ + "\n";
    for (const std::string& entry : trace_) {
        if (!entry.empty()) {
            text += "\t" + entry + "\n";
        }
    }
    return text;
}

}  // namespace Varnholt::Utilities::Exceptions
