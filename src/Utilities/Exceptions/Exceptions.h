#pragma once

#include <stdexcept>
#include <string>

#include "Utilities/Exceptions/ExceptionAdapter.h"
#include "Utilities/Exceptions/Location.h"
#include "Utilities/Tools/TypeName.h"

/// The general exception classes. Each is built from a message, a location (see `Here`) and, if it has one, a
/// cause; it is thrown by value and caught by reference. `RuntimeException` and what lies below it is what
/// the exported functions report by text.
namespace Varnholt::Utilities::Exceptions {

class RuntimeException : public ExceptionAdapter<std::runtime_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class OverflowException final : public ExceptionAdapter<std::overflow_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class UnderflowException final : public ExceptionAdapter<std::underflow_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class RangeException final : public ExceptionAdapter<std::range_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class LogicException final : public ExceptionAdapter<std::logic_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class DomainException final : public ExceptionAdapter<std::domain_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class InvalidArgumentException final : public ExceptionAdapter<std::invalid_argument> {
    using ExceptionAdapter::ExceptionAdapter;
};
class LengthException final : public ExceptionAdapter<std::length_error> {
    using ExceptionAdapter::ExceptionAdapter;
};
class OutOfRangeException final : public ExceptionAdapter<std::out_of_range> {
    using ExceptionAdapter::ExceptionAdapter;
};
/// Answers "bad allocation" whatever message it was given.
class BadAllocException final : public ExceptionAdapter<std::bad_alloc> {
    using ExceptionAdapter::ExceptionAdapter;
};
/// Answers "bad cast" whatever message it was given.
class BadCastException final : public ExceptionAdapter<std::bad_cast> {
    using ExceptionAdapter::ExceptionAdapter;
};
/// Answers "bad typeid" whatever message it was given.
class BadTypeidException final : public ExceptionAdapter<std::bad_typeid> {
    using ExceptionAdapter::ExceptionAdapter;
};

/// An object or buffer that cannot be made, or a resource that is not in the state the caller expects.
class ResourceException final : public RuntimeException {
    using RuntimeException::RuntimeException;
};

/// An empty `SmartPointer` was used; the message names the pointee's type.
class NullPointerException final : public RuntimeException {
  public:
    template <class T>
    NullPointerException(const T*, const std::string& location)
        : RuntimeException("accessed null pointer (" + Tools::ReadableName(typeid(T)) + ")", location) {}
};

}  // namespace Varnholt::Utilities::Exceptions
