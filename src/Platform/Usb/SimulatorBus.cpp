#include "Platform/Usb/SimulatorBus.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <optional>
#include <set>
#include <sstream>
#include <utility>

#include "Platform/Linux/ErrnoCodes.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/UsbIpDevice.h"

namespace Varnholt::Platform::Usb {
namespace {

/// The names of the sockets at which somebody listens, in order.
std::set<std::string> ListeningSockets() {
    constexpr unsigned long acceptsConnections = 0x10000;
    const std::string prefix = std::string("@") + SimulatorSocketPrefix;
    std::set<std::string> sockets;
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
                sockets.insert(name);
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
        error =
            Linux::CodeOf(errno) == Errors::AccessDenied ? Errors::AccessDenied : Errors::DeviceNotConnected;
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

class SimulatorsOfThisUser final : public UsbBus {
  public:
    std::vector<std::string> List() override {
        std::vector<std::string> names;
        for (const std::string& name : ListeningSockets()) {
            if (IsUsableSimulator(name)) {
                names.push_back(SimulatedPrefix + name);
            }
        }
        return names;
    }

    bool Has(const std::string& prefixedName) override {
        const std::string name = NameBehindPrefix(prefixedName);
        return IsSimulatorName(name) && IsUsableSimulator(name);
    }

    std::shared_ptr<UsbDevice> Open(const std::string& prefixedName, ErrorCode& error) override {
        const std::string name = NameBehindPrefix(prefixedName);
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
    static std::string NameBehindPrefix(const std::string& name) {
        const std::string prefix = SimulatedPrefix;
        return name.starts_with(prefix) ? name.substr(prefix.size()) : "";
    }
    static bool IsUsableSimulator(const std::string& name) {
        const auto info = Describe(name);
        return info && info->usable;
    }
};

}  // namespace

std::vector<SimulatorInfo> ListSimulators() {
    std::vector<SimulatorInfo> simulators;
    for (const std::string& name : ListeningSockets()) {
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
