#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "Support/ResourceCount.h"

namespace Varnholt::TestSupport {
namespace {

std::size_t CountEntries(const char* directory) {
    const std::filesystem::directory_iterator entries(directory);
    return static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
}

std::size_t CountMappedFiles() {
    std::ifstream maps("/proc/self/maps");
    std::size_t count = 0;
    for (std::string line; std::getline(maps, line);) {
        count += line.find(" /") != std::string::npos ? 1U : 0U;
    }
    return count;
}

}  // namespace

ResourceCount ResourceCount::Take() {
    return {CountEntries("/proc/self/task"), CountEntries("/proc/self/fd"), CountMappedFiles()};
}

}  // namespace Varnholt::TestSupport
