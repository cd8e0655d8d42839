#include "Holder.h"

namespace Varnholt::Cli {

/// The system does not say.
std::string HolderOf(const std::string&) {
    return {};
}

}  // namespace Varnholt::Cli
