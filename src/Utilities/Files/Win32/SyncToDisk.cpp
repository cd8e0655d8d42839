#include "Utilities/Files/SyncToDisk.h"

#include <windows.h>

namespace Varnholt::Utilities::Files {

bool SyncToDisk(const std::string& path) {
    const HANDLE file = ::CreateFileA(path.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE,
                                      nullptr, OPEN_EXISTING, 0, nullptr);
    if (file == INVALID_HANDLE_VALUE) {
        return false;
    }
    const bool synced = ::FlushFileBuffers(file) != 0;
    ::CloseHandle(file);
    return synced;
}

}  // namespace Varnholt::Utilities::Files
