#pragma once

#include <exception>
#include <list>
#include <ostream>
#include <string>
#include <typeinfo>

namespace Varnholt::Utilities::Exceptions {

/// A snapshot of another exception: its dynamic type, its message and, where it has one, its trace.
class Cause : public std::exception {
  public:
    /// Describes nothing.
    Cause() = default;
    explicit Cause(const std::exception& snapshotOf);

    const char* what() const noexcept override { return message_.c_str(); }

    bool IsEmpty() const noexcept { return type_ == nullptr; }

    /// Writes "\ncaused by: ", the type, ": ", the message and a newline, then each trace entry on a line of
    /// its own behind a tab.
    void Print(std::ostream& stream) const { stream << Text(); }
    /// The same as a text: a program that prints it in another way does without streams.
    std::string Text() const;

  private:
    const std::type_info* type_ = nullptr;
    std::list<std::string> trace_;
    std::string message_;
};

}  // namespace Varnholt::Utilities::Exceptions
