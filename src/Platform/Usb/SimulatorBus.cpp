#include "Platform/Usb/SimulatorBus.h"

#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <optional>
#include <set>
#include <utility>

#include "Platform/Linux/ErrnoCodes.h"
#include "Platform/Linux/FileDescriptor.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/UsbIpDevice.h"
#include "Platform/Usb/UsbIpOperations.h"

namespace Varnholt::Platform::Usb {
namespace {

/// The names of simulators' sockets, in order. Whether somebody still listens there, connecting tells.
std::set<std::string> SimulatorSockets() {
    const std::string prefix = std::string("@") + SimulatorSocketPrefix;
    std::set<std::string> sockets;
    std::ifstream table("/proc/net/unix");
    std::string line;
    while (std::getline(table, line)) {
        const std::size_t start = line.find(prefix);
        const std::string name = start == std::string::npos ? "" : line.substr(start + prefix.size());
        if (IsSimulatorName(name)) {
            sockets.insert(name);
        }
    }
    return sockets;
}

/// A connection whose other end was looked at.
struct Connection {
    Linux::FileDescriptor file;
    SimulatorInfo info;
};

/// Nothing, with the reason in `errno`, where there is no connection.
std::optional<Connection> Connect(const std::string& name) {
    Connection connection{Linux::FileDescriptor(ConnectToSimulator(name)), {}};
    if (!connection.file) {
        return std::nullopt;
    }
    connection.info.name = SimulatedPrefix + name;
    if (const auto peer = CredentialsOfPeer(connection.file.Get())) {
        connection.info.userId = peer->userId;
        connection.info.processId = peer->processId;
        // Root's would refuse anybody else, and root trusts no other user's.
        connection.info.usable = peer->userId == geteuid();
    }
    return connection;
}

UsbIpConnector ConnectorTo(const std::string& name) {
    return [name](ErrorCode& error) {
        auto connection = Connect(name);
        if (connection && connection->info.usable) {
            error = Errors::Success;
            return connection->file.Release();
        }
        const bool isDenied = connection || Linux::CodeOf(errno) == Errors::AccessDenied;
        error = isDenied ? Errors::AccessDenied : Errors::DeviceNotConnected;
        return -1;
    };
}

/// Finds out who uses it: the simulator writes who has opened the instrument behind its path.
void AskForUser(Linux::FileDescriptor file, SimulatorInfo& info) {
    UsbIpSocket socket(file.Release());
    const auto record = FirstUsbIpDevice(socket);
    info.answers = record.has_value();
    if (!record) {
        return;
    }
    const std::string& path = record->path;
    if (const auto mark = path.find(UsedByMark); mark != std::string::npos) {
        info.usedBy = path.substr(mark + std::string(UsedByMark).size());
    }
}

class SimulatorsOfThisUser final : public UsbBus {
  public:
    std::vector<std::string> List() override {
        std::vector<std::string> names;
        for (const std::string& name : SimulatorSockets()) {
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
        const auto connection = IsSimulatorName(name) ? Connect(name) : std::nullopt;
        if (connection && connection->info.usable) {
            error = Errors::Success;
            return MakeUsbIpDevice(ConnectorTo(name), SimulatorBusId);
        }
        error = connection ? Errors::AccessDenied : Errors::FileNotFound;
        return nullptr;
    }

  private:
    static std::string NameBehindPrefix(const std::string& name) {
        const std::string prefix = SimulatedPrefix;
        return name.starts_with(prefix) ? name.substr(prefix.size()) : "";
    }
    static bool IsUsableSimulator(const std::string& name) {
        const auto connection = Connect(name);
        return connection && connection->info.usable;
    }
};

}  // namespace

std::vector<SimulatorInfo> ListSimulators() {
    std::vector<SimulatorInfo> simulators;
    for (const std::string& name : SimulatorSockets()) {
        if (auto connection = Connect(name)) {
            SimulatorInfo& info = simulators.emplace_back(std::move(connection->info));
            if (info.usable) {
                AskForUser(std::move(connection->file), info);
            }
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
