#pragma once

#include <exception>
#include <string>

#include "Utilities/Exceptions/SourceLocation.h"

namespace Varnholt::Utilities::Exceptions {

/// Throws the class of this hierarchy that matches the exact dynamic type of `exception`, with its message
/// and `location` as the only trace entry. A type outside the table becomes a `RuntimeException` whose
/// message is the type's readable name, a blank and the message.
[[noreturn]] void TranslateStdException(const std::exception& exception, const std::string& location);

/// Called inside a handler: adds `location` to the exception under way if it is one of this hierarchy,
/// translates it otherwise, and goes on throwing.
[[noreturn]] void RethrowTraced(const SourceLocation& location = SourceLocation::current());

}  // namespace Varnholt::Utilities::Exceptions

/// Stands behind the function-try-block of a traced operation:
///     int Foo::Bar() try { ... }
///     TRACED
/// Costs nothing until something is thrown. Destructors must not use it: they let nothing out.
#define TRACED                                              \
    catch (...) {                                           \
        ::Varnholt::Utilities::Exceptions::RethrowTraced(); \
    }
