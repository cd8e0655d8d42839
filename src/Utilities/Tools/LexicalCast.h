#pragma once

#include <sstream>
#include <stdexcept>
#include <string>

#include "Utilities/Tools/TypeName.h"

namespace Varnholt::Utilities::Tools {

/// Converts `value` through a text stream. A text that does not begin with a `Target` raises
/// `std::invalid_argument`; what follows it does not matter.
template <class Target, class Source>
Target lexical_cast(const Source& value) {
    std::stringstream stream;
    stream << value;
    if constexpr (std::is_same_v<Target, std::string>) {
        if (stream) {
            return stream.str();
        }
    } else {
        Target result{};
        if (stream && stream >> result) {
            return result;
        }
    }
    std::ostringstream shown;
    shown << value;
    throw std::invalid_argument("lexical_cast(): fail to convert '" + shown.str() + "' from " +
                                ReadableName(typeid(Source)) + " to " + ReadableName(typeid(Target)));
}

}  // namespace Varnholt::Utilities::Tools
