#include "Service/Linux/DeviceHolders.h"

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

std::vector<DeviceHolder> FindHolders(const std::string& deviceNode) {
    std::vector<DeviceHolder> holders;
    std::error_code error;
    for (fs::directory_iterator process("/proc", error), end; !error && process != end;
         process.increment(error)) {
        const std::string number = process->path().filename();
        DeviceHolder holder;
        const auto [next, failure] =
            std::from_chars(number.data(), number.data() + number.size(), holder.processId);
        if (failure != std::errc() || next != number.data() + number.size() || holder.processId == getpid() ||
            !HasOpen(process->path(), deviceNode)) {
            continue;
        }
        std::ifstream(process->path() / "comm") >> holder.name;
        holders.push_back(holder);
    }
    return holders;
}

}  // namespace Varnholt::Service
