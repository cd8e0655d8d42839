#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace Varnholt::Cli {

/// The content of an EEPROM, 8192 bytes.
using EepromImage = std::vector<std::uint8_t>;

/// Throws `ToolFailure`: `ExitCode::File` when it cannot be read, `ExitCode::BadData` when it is not an image
/// by its size.
EepromImage ReadImageFile(const std::string& name);

/// Any file of at most `limit` bytes.
std::vector<std::uint8_t> ReadWholeFile(const std::string& name, std::size_t limit);

}  // namespace Varnholt::Cli
