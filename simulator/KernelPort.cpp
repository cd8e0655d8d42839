#include "KernelPort.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <string>

#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Usb/UsbIpProtocol.h"

namespace Varnholt::Simulator {
namespace {

/// Where the kernel shows its virtual USB host.
constexpr const char* Folder = "/sys/devices/platform/vhci_hcd.0";

/// The port of the least used controller: devices on one controller are made ready one after the other.
std::optional<unsigned> FindFreePort() {
    constexpr unsigned highest = 128;
    constexpr unsigned isFree = 4;
    std::optional<unsigned> best;
    unsigned fewestUsed = ~0U;
    for (unsigned controller = 0; controller < highest; ++controller) {
        std::ifstream status(std::string(Folder) + "/status" +
                             (controller ? "." + std::to_string(controller) : ""));
        if (!status) {
            break;
        }
        std::optional<unsigned> first;
        unsigned used = 0;
        std::string line;
        while (std::getline(status, line)) {
            std::istringstream fields(line);
            std::string hub;
            unsigned port = 0;
            unsigned state = 0;
            if (fields >> hub >> port >> state && hub == "hs") {
                used += state == isFree ? 0 : 1;
                first = state == isFree && !first ? std::optional(port) : first;
            }
        }
        if (first && used < fewestUsed) {
            best = first;
            fewestUsed = used;
        }
    }
    return best;
}

}  // namespace

unsigned PlugIntoKernel(int connectedSocket, std::uint32_t deviceId) {
    std::error_code error;
    if (!std::filesystem::exists(Folder, error)) {
        throw std::runtime_error("the kernel's virtual USB host is not there; as root: modprobe vhci-hcd");
    }
    const auto port = FindFreePort();
    if (!port) {
        throw std::runtime_error("no port of the kernel's virtual USB host is free");
    }
    const std::string order = std::to_string(*port) + " " + std::to_string(connectedSocket) + " " +
                              std::to_string(deviceId) + " " +
                              std::to_string(Platform::Usb::UsbIp::HighSpeed);
    const Platform::Linux::FileDescriptor file(
        open((std::string(Folder) + "/attach").c_str(), O_WRONLY | O_CLOEXEC));
    if (!file || write(file.Get(), order.data(), order.size()) != static_cast<ssize_t>(order.size())) {
        throw std::runtime_error("the kernel does not take the device: " + std::string(std::strerror(errno)));
    }
    return *port;
}

}  // namespace Varnholt::Simulator
