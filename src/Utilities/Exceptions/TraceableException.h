#pragma once

#include <list>
#include <ostream>
#include <string>

#include "Utilities/Exceptions/Cause.h"

namespace Varnholt::Utilities::Exceptions {

/// Turns the verbose texts of `what()` on or off for the whole process; off at load. Set it before any other
/// use of the library: the flag is read without a lock.
void SetVerboseText(bool verbose);
bool IsVerboseText();

/// Root of the library's exceptions: carries the locations it has passed on its way up, throw site first, and
/// the cause that it was made with. The library's own exceptions have none: it is for those who catch one
/// exception and throw another.
class TraceableException {
  public:
    virtual ~TraceableException() = default;
    virtual const char* what() const noexcept = 0;

    void AddLocation(const std::string& location) { trace_.push_back(location); }
    const std::list<std::string>& GetTrace() const noexcept { return trace_; }
    /// Empty where none was recorded.
    const Cause& GetCause() const noexcept { return cause_; }

    /// Writes the trace, each entry behind a tab, entries separated by newlines; empty entries write nothing.
    /// The cause follows where there is one.
    void Print(std::ostream& stream) const { stream << TraceText(); }
    /// The same as a text.
    std::string TraceText() const;

  protected:
    explicit TraceableException(const std::string& location, const Cause& recorded = {})
        : trace_{location}, cause_(recorded) {}
    TraceableException(const TraceableException&) = default;
    TraceableException& operator=(const TraceableException&) = default;

  private:
    std::list<std::string> trace_;
    Cause cause_;
};

}  // namespace Varnholt::Utilities::Exceptions
