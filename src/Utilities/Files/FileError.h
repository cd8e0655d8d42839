#pragma once

#include <stdexcept>
#include <string>
#include <utility>

namespace Varnholt::Utilities::Files {

/// A file that cannot be read or written: what went wrong, naming the file, and the way out where there is
/// one (may be empty).
class FileError final : public std::runtime_error {
  public:
    explicit FileError(const std::string& message, std::string wayOut = {})
        : std::runtime_error(message), advice_(std::move(wayOut)) {}

    const std::string& Advice() const { return advice_; }

  private:
    std::string advice_;
};

}  // namespace Varnholt::Utilities::Files
