#pragma once

#include <array>
#include <ostream>

#include "Output/OutputDescriptor.h"

namespace Varnholt::Cli {

/// A stream on a descriptor, with a small buffer that is written when it is full, with `flush` and at the
/// end. The reason of a failure is left in `errno`.
class DescriptorStream final : public std::ostream {
  public:
    enum class Lost {
        IsFailure,  ///< what cannot be written
        IsIgnored,  ///< for messages: the next one may get through
    };
    /// `userInterruption` outlives the stream.
    DescriptorStream(OutputDescriptor target, const Service::Interruption& userInterruption, Lost lost);

  private:
    class Buffer final : public std::streambuf {
      public:
        Buffer(OutputDescriptor openTarget, const Service::Interruption& userInterruption, Lost whatIsLost);
        ~Buffer() override;

      protected:
        int_type overflow(int_type character) override;
        std::streamsize xsputn(const char* text, std::streamsize size) override;
        int sync() override;

      private:
        std::size_t Write(std::span<const char> bytes);

        OutputDescriptor target_;
        const Service::Interruption& interruption_;
        const Lost lost_;
        std::array<char, 16384> room_{};
    };

    Buffer buffer_;
};

}  // namespace Varnholt::Cli
