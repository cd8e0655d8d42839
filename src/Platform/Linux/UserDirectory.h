#pragma once

#include <memory>
#include <string>

#include "Platform/Linux/FileDescriptor.h"

namespace Varnholt::Platform::Linux {

/// The directory in the machine's shared memory that only this process's user can write in: what others do
/// there cannot stand in the way of its names. It stays when its files have gone.
///
/// Its name has the user's number. Everybody may write in the directory above, so somebody else may have
/// taken that name; then the directory is the first of "NAME.1", "NAME.2" and so on that can be had.
/// (Processes that begin before and after such a squatter has gone do not meet. For an instrument that is no
/// harm: only one process can have its USB interface.)
class UserDirectory final {
  public:
    static constexpr const char* SharedMemory = "/dev/shm";

    /// Makes it where it is absent. Null on failure with the reason in `LastError`.
    static std::unique_ptr<UserDirectory> Open(const std::string& above = SharedMemory);

    /// For the system's operations on what is in a directory.
    int Descriptor() const { return descriptor_.Get(); }
    const std::string& Path() const { return path_; }

  private:
    UserDirectory() = default;

    std::string path_;
    FileDescriptor descriptor_;
};

}  // namespace Varnholt::Platform::Linux
