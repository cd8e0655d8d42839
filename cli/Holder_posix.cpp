#include "Holder.h"

namespace Varnholt::Cli {

std::string HolderOf(const std::string&) {
    return {};
}

}  // namespace Varnholt::Cli
