#pragma once

#include <concepts>
#include <new>
#include <string>
#include <type_traits>
#include <typeinfo>

#include "Utilities/Exceptions/TraceableException.h"

namespace Varnholt::Utilities::Exceptions {

/// The traceable half of an adapted exception.
class TraceableExceptionAdapter : public TraceableException {
  public:
    const char* what() const noexcept override { return GetStdMessage(); }
    virtual const char* GetStdMessage() const noexcept = 0;

  protected:
    using TraceableException::TraceableException;
};

/// The standard half: `X` with its message where it takes one.
template <std::derived_from<std::exception> X>
class StdExceptionAdapter : public X {
  public:
    const char* what() const noexcept override { return GetTraceableText(); }
    virtual const char* GetTraceableText() const noexcept = 0;

  protected:
    explicit StdExceptionAdapter(
        const std::string& message) requires std::constructible_from<X, const std::string&> : X(message) {}
    explicit StdExceptionAdapter(const std::string&) noexcept
        requires(!std::constructible_from<X, const std::string&>) {}
};

/// A standard exception that carries a trace. `what()` is the plain message of `X`; with the verbose switch
/// on it is followed by the trace, in a text that stays valid until the next call or the object's end.
template <std::derived_from<std::exception> X>
class ExceptionAdapter : public StdExceptionAdapter<X>, public TraceableExceptionAdapter {
  public:
    ExceptionAdapter(const std::string& message, const std::string& location, const Cause& recorded = {})
        : StdExceptionAdapter<X>(message), TraceableExceptionAdapter(location, recorded) {}

    const char* what() const noexcept override {
        if (!IsVerboseText()) {
            return GetStdMessage();
        }
        try {
            whatText_ = GetStdMessage();
            if (const std::string traceText = TraceText(); !traceText.empty()) {
                whatText_ += "\n" + traceText;
            }
            return whatText_.c_str();
        } catch (...) {
            return GetStdMessage();  // no memory for the long text
        }
    }
    const char* GetTraceableText() const noexcept override { return what(); }
    const char* GetStdMessage() const noexcept override {
        if constexpr (std::same_as<X, std::bad_alloc>) {
            return "bad allocation";
        } else if constexpr (std::same_as<X, std::bad_cast>) {
            return "bad cast";
        } else if constexpr (std::same_as<X, std::bad_typeid>) {
            return "bad typeid";
        } else {
            return X::what();
        }
    }

  private:
    mutable std::string whatText_;
};

}  // namespace Varnholt::Utilities::Exceptions
