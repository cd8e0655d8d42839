#pragma once

#include <array>
#include <ostream>
#include <streambuf>

#include "Output/OutputDescriptor.h"

namespace Varnholt::Cli {

/// A stream on a descriptor, with a small buffer that is written when it is full, with `flush` and at the
/// end. The reason of a failure is left in `errno`.
class DescriptorStream final : private std::streambuf, public std::ostream {
  public:
    enum class Lost {
        IsFailure,  ///< what cannot be written
        IsIgnored,  ///< for messages: the next one may get through
    };
    /// `userInterruption` outlives the stream.
    DescriptorStream(OutputDescriptor openTarget, const Service::Interruption& userInterruption,
                     Lost whatIsLost);
    ~DescriptorStream() override;

  private:
    int overflow(int character) override;
    std::streamsize xsputn(const char* text, std::streamsize size) override;
    int sync() override;
    std::size_t Write(std::span<const char> bytes);

    OutputDescriptor target_;
    const Service::Interruption& interruption_;
    const Lost lost_;
    std::array<char, 16384> room_{};
};

}  // namespace Varnholt::Cli
