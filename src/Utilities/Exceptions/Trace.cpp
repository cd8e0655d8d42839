#include "Utilities/Exceptions/Trace.h"

#include "Utilities/Exceptions/Exceptions.h"

namespace Varnholt::Utilities::Exceptions {
namespace {

/// Throws `Target` when the dynamic type of `exception` is exactly `Source`.
template <class Source, class Target>
void TranslateExactly(const std::exception& exception, const std::string& location) {
    if (typeid(exception) == typeid(Source)) {
        throw Target(exception.what(), location);
    }
}

}  // namespace

void TranslateStdException(const std::exception& exception, const std::string& location) {
    TranslateExactly<std::runtime_error, RuntimeException>(exception, location);
    TranslateExactly<std::overflow_error, OverflowException>(exception, location);
    TranslateExactly<std::underflow_error, UnderflowException>(exception, location);
    TranslateExactly<std::range_error, RangeException>(exception, location);
    TranslateExactly<std::logic_error, LogicException>(exception, location);
    TranslateExactly<std::domain_error, DomainException>(exception, location);
    TranslateExactly<std::invalid_argument, InvalidArgumentException>(exception, location);
    TranslateExactly<std::length_error, LengthException>(exception, location);
    TranslateExactly<std::out_of_range, OutOfRangeException>(exception, location);
    TranslateExactly<std::bad_alloc, BadAllocException>(exception, location);
    TranslateExactly<std::bad_typeid, BadTypeidException>(exception, location);
    TranslateExactly<std::bad_cast, BadCastException>(exception, location);
    throw RuntimeException(Tools::ReadableName(typeid(exception)) + " " + exception.what(), location);
}

void RethrowTraced(const SourceLocation& location) {
    try {
        throw;
    } catch (TraceableException& exception) {
        exception.AddLocation(Here(location));
        throw;
    } catch (const std::exception& exception) {
        TranslateStdException(exception, Here(location));
    } catch (...) {
        throw RuntimeException("unkown exception caught", Here(location));
    }
}

}  // namespace Varnholt::Utilities::Exceptions
