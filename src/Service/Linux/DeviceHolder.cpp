#include "Service/Linux/DeviceHolder.h"

#include <fmt/format.h>
#include <unistd.h>

#include <charconv>
#include <filesystem>
#include <fstream>

namespace Varnholt::Service {
namespace {

namespace fs = std::filesystem;

bool HasOpen(const fs::path& process, const std::string& deviceNode) {
    std::error_code error;
    for (fs::directory_iterator file(process / "fd", error), end; !error && file != end;
         file.increment(error)) {
        std::error_code unreadable;
        if (fs::read_symlink(file->path(), unreadable) == deviceNode) {
            return true;
        }
    }
    return false;
}

}  // namespace

std::string FindHolder(const std::string& deviceNode) {
    std::error_code error;
    for (fs::directory_iterator process("/proc", error), end; !error && process != end;
         process.increment(error)) {
        const std::string number = process->path().filename();
        int id = 0;
        const auto [next, failure] = std::from_chars(number.data(), number.data() + number.size(), id);
        if (failure == std::errc() && next == number.data() + number.size() && id != getpid() &&
            HasOpen(process->path(), deviceNode)) {
            std::string name;
            std::ifstream(process->path() / "comm") >> name;
            return fmt::format("{} (process {})", name, id);
        }
    }
    return {};
}

}  // namespace Varnholt::Service
