#include "Utilities/Exceptions/TraceableException.h"

namespace Varnholt::Utilities::Exceptions {
namespace {
bool verboseText = false;
}

void SetVerboseText(bool verbose) {
    verboseText = verbose;
}

bool IsVerboseText() {
    return verboseText;
}

void TraceableException::Print(std::ostream& stream) const {
    bool first = true;
    for (const std::string& entry : trace_) {
        if (!entry.empty()) {
            stream << (first ? "\t" : "\n\t") << entry;
        }
        first = false;
    }
    if (!cause_.IsEmpty()) {
        cause_.Print(stream);
    }
}

}  // namespace Varnholt::Utilities::Exceptions
