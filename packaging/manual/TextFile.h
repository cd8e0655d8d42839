#pragma once

#include <filesystem>
#include <string>

namespace Varnholt::Manual {

/// Throws `std::runtime_error` when it cannot be written.
void WriteTextFile(const std::filesystem::path& file, const std::string& content);

}  // namespace Varnholt::Manual
