#pragma once

#include <unistd.h>

#include <cerrno>

#include "Platform/Owned.h"

namespace Varnholt::Platform::Linux {

/// Leaves `errno` alone.
inline void CloseFileDescriptor(int number) {
    const int error = errno;
    close(number);
    errno = error;
}
using FileDescriptor = Owned<int, -1, CloseFileDescriptor>;

}  // namespace Varnholt::Platform::Linux
