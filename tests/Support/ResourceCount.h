#pragma once

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <ostream>
#include <string>
#include <thread>

namespace Varnholt::TestSupport {

/// What this process has taken from the system, on Linux. Counts that lag behind (a thread that has been
/// joined may still be listed for a moment) are the reason for `Settles`.
struct ResourceCount {
    std::ptrdiff_t threads = CountEntries("/proc/self/task");
    std::ptrdiff_t files = CountEntries("/proc/self/fd");  ///< descriptors
    std::ptrdiff_t maps = CountMappedFiles();

    bool operator==(const ResourceCount&) const = default;

    /// Once the counts no longer change, for a few seconds at most: where calls have gone before.
    static ResourceCount TakeSettled() {
        ResourceCount count;
        for (int same = 0, i = 0; same < 10 && i < 300; ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
            const ResourceCount now;
            same = now == count ? same + 1 : 0;
            count = now;
        }
        return count;
    }
    /// Waits until the counts are these, for a few seconds at most, and answers whether they are.
    bool Settles() const {
        for (int i = 0; i < 300 && ResourceCount() != *this; ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return ResourceCount() == *this;
    }

  private:
    static std::ptrdiff_t CountEntries(const char* directory) {
        const std::filesystem::directory_iterator entries(directory);
        return std::distance(begin(entries), end(entries));
    }
    static std::ptrdiff_t CountMappedFiles() {
        std::ifstream maps("/proc/self/maps");
        std::ptrdiff_t count = 0;
        for (std::string line; std::getline(maps, line);) {
            count += line.find(" /") != std::string::npos ? 1 : 0;
        }
        return count;
    }
};

inline std::ostream& operator<<(std::ostream& stream, const ResourceCount& count) {
    return stream << count.threads << " threads, " << count.files << " files, " << count.maps << " maps";
}

}  // namespace Varnholt::TestSupport
