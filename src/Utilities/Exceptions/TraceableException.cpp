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

std::string TraceableException::TraceText() const {
    std::string text;
    bool first = true;
    for (const std::string& entry : trace_) {
        if (!entry.empty()) {
            text += (first ? "\t" : "\n\t") + entry;
        }
        first = false;
    }
    return text + cause_.Text();
}

}  // namespace Varnholt::Utilities::Exceptions
