#pragma once

#include <string>
#include <typeinfo>

namespace Varnholt::Utilities::Tools {

/// The type's name as a reader would write it, demangled where the compiler mangles it.
std::string ReadableName(const std::type_info& type);

}  // namespace Varnholt::Utilities::Tools
