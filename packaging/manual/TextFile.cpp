#include "TextFile.h"

#include <fstream>
#include <stdexcept>

namespace Varnholt::Manual {

void WriteTextFile(const std::filesystem::path& file, const std::string& content) {
    std::filesystem::create_directories(file.parent_path());
    std::ofstream stream(file);
    stream << content << std::flush;
    if (!stream) {
        throw std::runtime_error(file.string() + " cannot be written");
    }
}

}  // namespace Varnholt::Manual
