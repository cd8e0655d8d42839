#include "Output/DescriptorStream.h"

#include <cerrno>
#include <cstring>

namespace Varnholt::Cli {

DescriptorStream::DescriptorStream(OutputDescriptor openTarget, const Service::Interruption& userInterruption,
                                   Lost whatIsLost)
    : std::ostream(static_cast<std::streambuf*>(this)),
      target_(std::move(openTarget)),
      interruption_(userInterruption),
      lost_(whatIsLost) {
    setp(room_.data(), room_.data() + room_.size());
}

DescriptorStream::~DescriptorStream() {
    DescriptorStream::sync();
}

/// How many of them count as written.
std::size_t DescriptorStream::Write(std::span<const char> bytes) {
    const OutputDescriptor::Outcome outcome = target_.Write(bytes, interruption_);
    if (!outcome.error || lost_ == Lost::IsIgnored) {
        return bytes.size();
    }
    errno = outcome.error.value();
    return outcome.accepted;
}

int DescriptorStream::sync() {
    const auto held = static_cast<std::size_t>(pptr() - pbase());
    const std::size_t written = Write({pbase(), held});
    // What is left stays in front, so that nothing is written twice.
    std::memmove(pbase(), pbase() + written, held - written);
    setp(room_.data(), room_.data() + room_.size());
    pbump(static_cast<int>(held - written));
    return written == held ? 0 : -1;
}

int DescriptorStream::overflow(int character) {
    if (sync() != 0) {
        return std::char_traits<char>::eof();
    }
    if (!std::char_traits<char>::eq_int_type(character, std::char_traits<char>::eof())) {
        *pptr() = std::char_traits<char>::to_char_type(character);
        pbump(1);
    }
    return std::char_traits<char>::not_eof(character);
}

/// What is larger than the buffer goes past it; the answer is then exact.
std::streamsize DescriptorStream::xsputn(const char* text, std::streamsize size) {
    if (size <= epptr() - pptr()) {
        std::memcpy(pptr(), text, static_cast<std::size_t>(size));
        pbump(static_cast<int>(size));
        return size;
    }
    if (sync() != 0) {
        return 0;
    }
    return static_cast<std::streamsize>(Write({text, static_cast<std::size_t>(size)}));
}

}  // namespace Varnholt::Cli
