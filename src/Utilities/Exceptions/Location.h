#pragma once

#include <string>

#include "Utilities/Exceptions/SourceLocation.h"

namespace Varnholt::Utilities::Exceptions {

/// The text that stands for one code location in a trace: `context`, "::", the qualified function name,
/// "(): ", the file name from its last "\src\" on (the whole name where it has none), ":" and the line.
std::string FormatLocation(const char* context, const char* function, const char* file, int line);

/// The qualified name inside a compiler's full signature ("int N::A::f(int) const" gives "N::A::f").
std::string QualifiedName(const char* signature);

/// The location text of the caller; built only where an exception is about to be thrown.
std::string Here(const SourceLocation& location = SourceLocation::current());

}  // namespace Varnholt::Utilities::Exceptions
