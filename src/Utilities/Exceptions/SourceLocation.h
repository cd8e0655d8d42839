#pragma once

#include <cstdint>
#include <source_location>

namespace Varnholt::Utilities::Exceptions {

#if defined(__cpp_lib_source_location)
using SourceLocation = std::source_location;
#else
/// For compilers that do not offer the standard class yet: knows the function's own name only.
class SourceLocation final {
  public:
    static constexpr SourceLocation current(const char* file = __builtin_FILE(),
                                            const char* function = __builtin_FUNCTION(),
                                            std::uint_least32_t line = __builtin_LINE()) noexcept {
        SourceLocation location;
        location.file_ = file;
        location.function_ = function;
        location.lineNumber_ = line;
        return location;
    }
    constexpr const char* file_name() const noexcept { return file_; }
    constexpr const char* function_name() const noexcept { return function_; }
    constexpr std::uint_least32_t line() const noexcept { return lineNumber_; }

  private:
    const char* file_ = "";
    const char* function_ = "";
    std::uint_least32_t lineNumber_ = 0;
};
#endif

}  // namespace Varnholt::Utilities::Exceptions
