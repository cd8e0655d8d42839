#include "Platform/Usb/SimulatorBus.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <map>
#include <mutex>
#include <optional>
#include <sstream>
#include <utility>

#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/UsbIpDevice.h"

namespace Varnholt::Platform::Usb {
namespace {

/// The sockets at which somebody listens: their numbers, by name. A number is not used again for another
/// socket.
std::map<std::string, std::string> ListeningSockets() {
    constexpr unsigned long acceptsConnections = 0x10000;
    const std::string prefix = std::string("@") + SimulatorSocketPrefix;
    std::map<std::string, std::string> sockets;
    std::ifstream table("/proc/net/unix");
    std::string line;
    while (std::getline(table, line)) {
        if (line.find(prefix) == std::string::npos) {
            continue;  // a desktop has hundreds of others
        }
        std::istringstream fields(line);
        std::string address;
        std::string references;
        std::string protocol;
        unsigned long flags = 0;
        std::string type;
        std::string state;
        std::string number;
        std::string path;
        fields >> address >> references >> protocol >> std::hex >> flags >> type >> state >> number >> path;
        if (fields && (flags & acceptsConnections) != 0 && path.starts_with(prefix)) {
            const std::string name = path.substr(prefix.size());
            if (IsSimulatorName(name)) {
                sockets[name] = number;
            }
        }
    }
    return sockets;
}

/// Root's would refuse anybody else, and root trusts no other user's.
bool IsUsable(std::uint32_t userId) {
    return userId == geteuid();
}

/// A connection whose other end was looked at.
struct Connection {
    int file = -1;
    PeerCredentials peer{};
    bool usable = false;
};

std::optional<Connection> Connect(const std::string& name) {
    Connection connection;
    connection.file = ConnectToSimulator(name);
    if (connection.file < 0) {
        return std::nullopt;
    }
    if (const auto peer = CredentialsOfPeer(connection.file)) {
        connection.peer = *peer;
        connection.usable = IsUsable(peer->userId);
    }
    return connection;
}

/// For the USB/IP client.
int ConnectToUsable(const std::string& name, ErrorCode& error) {
    const auto connection = Connect(name);
    if (!connection) {
        error = errno == EACCES || errno == EPERM ? Errors::AccessDenied : Errors::DeviceNotConnected;
        return -1;
    }
    if (!connection->usable) {
        close(connection->file);
        error = Errors::AccessDenied;
        return -1;
    }
    error = Errors::Success;
    return connection->file;
}

UsbIpConnector ConnectorTo(const std::string& name) {
    return [name](ErrorCode& error) { return ConnectToUsable(name, error); };
}

std::optional<SimulatorInfo> Describe(const std::string& name) {
    const auto connection = Connect(name);
    if (!connection) {
        return std::nullopt;
    }
    close(connection->file);
    SimulatorInfo info;
    info.name = SimulatedPrefix + name;
    info.userId = connection->peer.userId;
    info.processId = connection->peer.processId;
    info.usable = connection->usable;
    return info;
}

/// Finds out who uses it: the simulator writes who has opened the instrument behind its path.
void AskForUser(const std::string& name, SimulatorInfo& info) {
    const auto records = ListUsbIpDevices(ConnectorTo(name));
    info.answers = records && !records->empty();
    if (!info.answers) {
        return;
    }
    const std::string& path = records->front().path;
    if (const auto mark = path.find(UsedByMark); mark != std::string::npos) {
        info.usedBy = path.substr(mark + std::string(UsedByMark).size());
    }
}

/// Opening an instrument asks some ten times what is there: who listens at a socket stays the same, and a
/// simulator is troubled once only.
class SimulatorsOfThisUser final : public UsbBus {
  public:
    std::vector<std::string> List() override {
        const std::lock_guard lock(mutex_);
        std::map<std::string, std::uint32_t> users;
        std::vector<std::string> names;
        for (const auto& [name, socket] : ListeningSockets()) {
            if (const auto known = userBySocket_.find(socket); known != userBySocket_.end()) {
                users.insert(*known);
            } else if (const auto info = Describe(name)) {
                users[socket] = info->userId;
            }
            if (const auto user = users.find(socket); user != users.end() && IsUsable(user->second)) {
                names.push_back(SimulatedPrefix + name);
            }
        }
        userBySocket_ = std::move(users);
        return names;
    }

    std::shared_ptr<UsbDevice> Open(const std::string& prefixedName, ErrorCode& error) override {
        const std::string prefix = SimulatedPrefix;
        const std::string name = prefixedName.starts_with(prefix) ? prefixedName.substr(prefix.size()) : "";
        const auto info = IsSimulatorName(name) ? Describe(name) : std::nullopt;
        if (!info) {
            error = Errors::FileNotFound;
            return nullptr;
        }
        if (!info->usable) {
            error = Errors::AccessDenied;
            return nullptr;
        }
        error = Errors::Success;
        return MakeUsbIpDevice(ConnectorTo(name), SimulatorBusId);
    }

  private:
    std::mutex mutex_;                                   // guards what follows
    std::map<std::string, std::uint32_t> userBySocket_;  // of those that listened the last time
};

}  // namespace

std::vector<SimulatorInfo> ListSimulators() {
    std::vector<SimulatorInfo> simulators;
    for (const auto& [name, socket] : ListeningSockets()) {
        if (auto info = Describe(name)) {
            if (info->usable) {
                AskForUser(name, *info);
            }
            simulators.push_back(std::move(*info));
        } else if (errno == EAGAIN) {
            SimulatorInfo& silent = simulators.emplace_back();
            silent.name = SimulatedPrefix + name;
            silent.answers = false;
        }
    }
    return simulators;
}

UsbBus& SimulatorBus() {
    static SimulatorsOfThisUser bus;
    return bus;
}

}  // namespace Varnholt::Platform::Usb
