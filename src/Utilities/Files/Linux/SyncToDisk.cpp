#include "Utilities/Files/SyncToDisk.h"

#include <fcntl.h>
#include <unistd.h>

#include "Platform/Linux/FileDescriptor.h"

namespace Varnholt::Utilities::Files {

bool SyncToDisk(const std::string& path) {
    const Platform::Linux::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    return file && ::fsync(file.Get()) == 0;
}

}  // namespace Varnholt::Utilities::Files
