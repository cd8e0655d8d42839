#include "Utilities/Tools/TypeName.h"

#include <cxxabi.h>

#include <cstdlib>
#include <memory>

namespace Varnholt::Utilities::Tools {

std::string ReadableName(const std::type_info& type) {
    const std::unique_ptr<char, void (*)(void*)> name(
        abi::__cxa_demangle(type.name(), nullptr, nullptr, nullptr), std::free);
    return name ? name.get() : type.name();
}

}  // namespace Varnholt::Utilities::Tools
