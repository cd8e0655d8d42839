#include "Utilities/Files/ByteSource.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "Platform/Linux/FileDescriptor.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Utilities::Files {
namespace {

class Descriptor final : public ByteSource {
  public:
    Descriptor(int openDescriptor, std::string name)
        : descriptor_(openDescriptor), shownName_(std::move(name)) {
        if (!descriptor_) {
            Fail();
        }
    }

    bool IsTerminal() const override { return ::isatty(descriptor_.Get()) != 0; }

    bool Wait(std::uint32_t milliseconds) override {
        pollfd watched{descriptor_.Get(), POLLIN, 0};
        const int found = ::poll(&watched, 1, static_cast<int>(milliseconds));
        if (found < 0 && errno != EINTR) {
            Fail();
        }
        return found > 0;
    }

    std::size_t Read(std::uint8_t* buffer, std::size_t size) override {
        const ssize_t count = ::read(descriptor_.Get(), buffer, size);
        if (count < 0) {
            Fail();
        }
        return static_cast<std::size_t>(count);
    }

  private:
    [[noreturn]] void Fail() const {
        throw FileError("cannot read " + shownName_ + ": " + std::generic_category().message(errno));
    }

    const Platform::Linux::FileDescriptor descriptor_;
    const std::string shownName_;
};

}  // namespace

std::unique_ptr<ByteSource> OpenByteSource(const std::string& name) {
    return std::make_unique<Descriptor>(::open(name.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC),
                                        name);
}

std::unique_ptr<ByteSource> OpenStandardInput() {
    return std::make_unique<Descriptor>(::fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 0), "standard input");
}

}  // namespace Varnholt::Utilities::Files
