#include "UsbIpServer.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <stdexcept>
#include <utility>

#include "Descriptors.h"
#include "FaultInjector.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/SimulatorBus.h"

namespace Varnholt::Simulator {

namespace UsbIp = Platform::Usb::UsbIp;
namespace Errors = Platform::Errors;
using Platform::Linux::FileDescriptor;
using Platform::Usb::UsbDevice;

namespace {

[[noreturn]] void Fail(const std::string& what) {
    throw std::runtime_error(what + ": " + std::strerror(errno));
}

std::string DescribeProcess(int processId) {
    std::ifstream file("/proc/" + std::to_string(processId) + "/comm");
    std::string command;
    std::getline(file, command);
    return "process " + std::to_string(processId) + (command.empty() ? "" : " (" + command + ")");
}

}  // namespace

/// An instrument and who has it.
struct UsbIpServer::Exported : Export {
    std::uint32_t number = 0;  // from 1: device number, and port in TCP bus ids
    std::string usedBy;

    UsbIp::DeviceRecord Record(const std::string& busId) const {
        UsbIp::DeviceRecord record;
        record.path = "/simulated/" + name + (usedBy.empty() ? "" : Platform::Usb::UsedByMark + usedBy);
        record.busId = busId;
        record.busNumber = 1;
        record.deviceNumber = number;
        record.vendorId = VendorId;
        record.productId = ProductId;
        record.version = DeviceVersion;
        record.classes = {VendorClass, 0, 0};
        record.configurationValue = ConfigurationValue;
        record.configurations = 1;
        record.interfaces = 1;
        return record;
    }
    std::string BusId() const { return "1-" + std::to_string(number); }
};

/// What one connection can import: the instruments of the socket that it came by.
class UsbIpServer::Exports final : public UsbIpExports {
  public:
    Exports(UsbIpServer& ownServer, std::vector<Exported*> offeredInstruments, std::string peer,
            bool ownBusIds)
        : server_(ownServer),
          offered_(std::move(offeredInstruments)),
          peerText_(std::move(peer)),
          tcp_(ownBusIds) {}
    ~Exports() override {
        if (imported_) {
            server_.Tell(imported_->name + ": released by " + peerText_);
            imported_->usedBy.clear();
        }
    }

    std::vector<UsbIp::DeviceRecord> List() override {
        std::vector<UsbIp::DeviceRecord> records;
        for (const Exported* const each : offered_) {
            records.push_back(each->Record(BusIdOf(*each)));
        }
        return records;
    }

    Import ImportDevice(const std::string& busId) override {
        const auto found =
            std::ranges::find_if(offered_, [&](const Exported* each) { return BusIdOf(*each) == busId; });
        if (found == offered_.end()) {
            return {UsbIp::OperationStatus::NoDevice, {}, nullptr};
        }
        return Take(**found);
    }

    Import Take(Exported& wanted) {
        std::shared_ptr<UsbDevice> device = SimulatedInstrument::Connect(wanted.instrument);
        if (const auto code = device->Claim(); code != Errors::Success) {
            return {code == Errors::Busy ? UsbIp::OperationStatus::Busy : UsbIp::OperationStatus::NoDevice,
                    {},
                    nullptr};
        }
        if (!wanted.faults.Faults().empty()) {
            // A fault's unplugging ends the connection; the instrument is back at once.
            const auto replug = [instrument = wanted.instrument] {
                instrument->Unplug();
                instrument->PlugIn();
            };
            device = InjectFaults(std::move(device), std::make_shared<FaultScript>(wanted.faults),
                                  server_.loop_, replug);
        }
        if (wanted.wrap) {
            device = wanted.wrap(std::move(device));
        }
        if (server_.log_) {
            device =
                LogTransfers(std::move(device), [tell = server_.log_, name = wanted.name](
                                                    const std::string& line) { tell(name + ": " + line); });
        }
        imported_ = &wanted;
        wanted.usedBy = peerText_;
        server_.Tell(wanted.name + ": opened by " + peerText_);
        return {UsbIp::OperationStatus::Ok, wanted.Record(BusIdOf(wanted)), std::move(device)};
    }

  private:
    std::string BusIdOf(const Exported& each) const {
        return tcp_ ? each.BusId() : Platform::Usb::SimulatorBusId;
    }

    UsbIpServer& server_;
    const std::vector<Exported*> offered_;
    const std::string peerText_;
    const bool tcp_;
    Exported* imported_ = nullptr;
};

UsbIpServer::UsbIpServer(PollLoop& pollLoop, Log logger) : loop_(pollLoop), log_(std::move(logger)) {}

UsbIpServer::~UsbIpServer() {
    loop_.Forget(this);
    connections_.clear();
    for (const Listener& listener : listeners_) {
        loop_.Unwatch(listener.file.Get());
    }
}

void UsbIpServer::Tell(const std::string& line) const {
    if (log_) {
        log_(line);
    }
}

void UsbIpServer::Add(Export added) {
    if (!Platform::Usb::IsSimulatorName(added.name)) {
        throw std::runtime_error("\"" + added.name +
                                 "\" is no name: letters, digits, '-', '_' and '.', at most 64 of them");
    }
    FileDescriptor file(Platform::Usb::ListenAsSimulator(added.name));
    if (!file && errno == EADDRINUSE) {
        throw std::runtime_error("an instrument named \"" + added.name +
                                 "\" is already simulated; choose another --name");
    }
    if (!file) {
        Fail("cannot listen for \"" + added.name + "\"");
    }
    Exported& exported = exportedInstruments_.emplace_back();
    static_cast<Export&>(exported) = std::move(added);
    exported.number = static_cast<std::uint32_t>(exportedInstruments_.size());
    ListenTo(std::move(file), {&exported}, true);
}

std::uint16_t UsbIpServer::ListenTcp(std::uint16_t port) {
    FileDescriptor file(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (!file) {
        Fail("no TCP socket");
    }
    const int on = 1;
    setsockopt(file.Get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof address;
    auto* const generic = reinterpret_cast<sockaddr*>(&address);
    constexpr int waitingConnections = 16;
    if (bind(file.Get(), generic, size) != 0 || listen(file.Get(), waitingConnections) != 0 ||
        getsockname(file.Get(), generic, &size) != 0) {
        Fail("cannot listen on TCP port " + std::to_string(port));
    }
    std::vector<Exported*> all;
    for (Exported& each : exportedInstruments_) {
        all.push_back(&each);
    }
    ListenTo(std::move(file), std::move(all), false);
    return ntohs(address.sin_port);
}

UsbIpServer::Exported& UsbIpServer::Find(const std::string& name) {
    const auto found = std::ranges::find(exportedInstruments_, name, &Exported::name);
    if (found == exportedInstruments_.end()) {
        throw std::runtime_error("no instrument named \"" + name + "\"");
    }
    return *found;
}

UsbIp::DeviceRecord UsbIpServer::Record(const std::string& name) {
    const Exported& exported = Find(name);
    return exported.Record(exported.BusId());
}

void UsbIpServer::ListenTo(FileDescriptor file, std::vector<Exported*> offered, bool unixSocket) {
    fcntl(file.Get(), F_SETFL, O_NONBLOCK);
    listeners_.push_back({std::move(file), unixSocket, std::move(offered)});
    Listen();
}

void UsbIpServer::Listen() {
    for (const Listener& listener : listeners_) {
        loop_.Watch(listener.file.Get(), POLLIN, [this, &listener] { Accept(listener); });
    }
}

void UsbIpServer::PauseListening() {
    constexpr std::uint64_t pause = 100'000;
    for (const Listener& listener : listeners_) {
        loop_.Unwatch(listener.file.Get());
    }
    loop_.CallAt(
        loop_.Now() + pause, [this] { Listen(); }, this);
}

void UsbIpServer::Accept(const Listener& listener) {
    constexpr std::size_t mostConnections = 256;
    FileDescriptor file(accept4(listener.file.Get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    if (!file) {
        if (errno != EAGAIN && errno != EINTR && errno != ECONNABORTED) {
            PauseListening();  // no file is left: one may be later
        }
        return;
    }
    std::string peer = "a TCP peer";
    if (listener.unixSocket) {
        const auto credentials = Platform::Usb::CredentialsOfPeer(file.Get());
        if (!credentials || !Platform::Usb::IsTrustedUser(credentials->userId)) {
            Tell("refused a process of another user");
            return;
        }
        peer = DescribeProcess(credentials->processId);
    } else {
        const int on = 1;
        setsockopt(file.Get(), IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    }
    if (connections_.size() < mostConnections) {
        auto exports = std::make_unique<Exports>(*this, listener.offered, peer, !listener.unixSocket);
        Connect(std::move(file), std::move(exports), nullptr, peer);
    }
}

void UsbIpServer::Serve(FileDescriptor connectedSocket, const std::string& name, const std::string& peer) {
    auto exports = std::make_unique<Exports>(*this, std::vector<Exported*>(), peer, false);
    std::shared_ptr<UsbDevice> device = exports->Take(Find(name)).device;
    if (!device) {
        throw std::runtime_error("\"" + name + "\" is in use");
    }
    fcntl(connectedSocket.Get(), F_SETFL, O_NONBLOCK);
    Connect(std::move(connectedSocket), std::move(exports), std::move(device), peer);
}

void UsbIpServer::Connect(FileDescriptor file, std::unique_ptr<Exports> exports,
                          std::shared_ptr<UsbDevice> imported, const std::string& peer) {
    const auto over = [this, peer](UsbIpConnection& connection, const std::string& complaint) {
        if (!complaint.empty()) {
            Tell(peer + ": " + complaint);
        }
        Remove(connection);
    };
    connections_.push_back(std::make_unique<UsbIpConnection>(loop_, std::move(file), std::move(exports),
                                                             std::move(imported), over));
}

void UsbIpServer::Remove(UsbIpConnection& connection) {
    const auto found =
        std::ranges::find_if(connections_, [&](const auto& each) { return each.get() == &connection; });
    loop_.CallSoon([kept = std::shared_ptr<UsbIpConnection>(std::move(*found))] {}, this);
    connections_.erase(found);
}

}  // namespace Varnholt::Simulator
