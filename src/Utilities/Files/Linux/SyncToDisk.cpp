#include "Utilities/Files/SyncToDisk.h"

#include <fcntl.h>
#include <unistd.h>

namespace Varnholt::Utilities::Files {

bool SyncToDisk(const std::string& path) {
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (file < 0) {
        return false;
    }
    const bool synced = ::fsync(file) == 0;
    ::close(file);
    return synced;
}

}  // namespace Varnholt::Utilities::Files
