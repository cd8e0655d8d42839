#pragma once

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace Varnholt::Platform::Linux {

/// Owns a file descriptor and closes it, which leaves `errno` alone.
class FileDescriptor final {
  public:
    FileDescriptor() = default;
    explicit FileDescriptor(int owned) : number_(owned) {}
    FileDescriptor(FileDescriptor&& other) noexcept : number_(other.Release()) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        std::swap(number_, other.number_);
        return *this;
    }
    ~FileDescriptor() {
        if (number_ >= 0) {
            const int error = errno;
            close(number_);
            errno = error;
        }
    }

    int Get() const { return number_; }
    explicit operator bool() const { return number_ >= 0; }
    /// The descriptor is the caller's from here on.
    int Release() { return std::exchange(number_, -1); }

  private:
    int number_ = -1;
};

}  // namespace Varnholt::Platform::Linux
