#include "Service/Holder.h"

namespace Varnholt::Service {

/// The system does not say.
std::string HolderOf(const std::string&) {
    return {};
}

}  // namespace Varnholt::Service
