#pragma once

#include <string>

namespace Varnholt::Utilities::Files {

/// Returns when the file's content has reached the disk, as far as the system can tell. False on failure.
bool SyncToDisk(const std::string& path);

}  // namespace Varnholt::Utilities::Files
