#include "Support/ResourceCount.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <ostream>
#include <string>
#include <thread>

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

ResourceCount ResourceCount::TakeSettled() {
    ResourceCount count = Take();
    for (int same = 0, i = 0; same < 10 && i < 300; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
        const ResourceCount now = Take();
        same = now == count ? same + 1 : 0;
        count = now;
    }
    return count;
}

bool ResourceCount::Settles() const {
    for (int i = 0; i < 300; ++i) {
        if (Take() == *this) {
            return true;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return false;
}

std::ostream& operator<<(std::ostream& stream, const ResourceCount& count) {
    return stream << count.threads << " threads, " << count.files << " files, " << count.maps << " maps";
}

}  // namespace Varnholt::TestSupport
