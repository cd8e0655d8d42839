#include "Output/StreamOutput.h"

#include <cerrno>
#include <ostream>

#include "Utilities/Files/FileError.h"

namespace Varnholt::Cli {

/// Past the stream to its buffer, which answers how much it took.
OutputDescriptor::Outcome StreamOutput::Take(std::span<const char> block) {
    const auto failed = [](std::size_t taken) {
        return OutputDescriptor::Outcome{taken, {errno != 0 ? errno : EIO, std::generic_category()}};
    };
    errno = 0;
    if (!stream_.flush()) {
        return failed(0);
    }
    const auto taken = static_cast<std::size_t>(
        stream_.rdbuf()->sputn(block.data(), static_cast<std::streamsize>(block.size())));
    if (taken < block.size()) {
        stream_.setstate(std::ios::badbit);
        return failed(taken);
    }
    return stream_.flush() ? OutputDescriptor::Outcome{taken, {}} : failed(0);
}

void StreamOutput::Fail(std::error_code error) const {
    throw Utilities::Files::FileError("the output cannot be written: " + error.message());
}

}  // namespace Varnholt::Cli
