#include "UsbIpServer.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <utility>

#include "Descriptors.h"
#include "FaultInjector.h"
#include "Platform/Usb/SimulatorAddress.h"
#include "Platform/Usb/SimulatorBus.h"

namespace Varnholt::Simulator {

namespace UsbIp = Platform::Usb::UsbIp;
namespace Errors = Platform::Errors;
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
        : server(ownServer),
          offered(std::move(offeredInstruments)),
          peerText(std::move(peer)),
          tcp(ownBusIds) {}
    ~Exports() override {
        if (imported) {
            server.Tell(imported->name + ": released by " + peerText);
            imported->usedBy.clear();
        }
    }

    std::vector<UsbIp::DeviceRecord> List() override {
        std::vector<UsbIp::DeviceRecord> records;
        for (const Exported* const each : offered) {
            records.push_back(each->Record(BusIdOf(*each)));
        }
        return records;
    }

    Import ImportDevice(const std::string& busId) override {
        const auto found =
            std::ranges::find_if(offered, [&](const Exported* each) { return BusIdOf(*each) == busId; });
        if (found == offered.end()) {
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
                                  server.loop, replug);
        }
        if (wanted.wrap) {
            device = wanted.wrap(std::move(device));
        }
        if (server.log) {
            device =
                LogTransfers(std::move(device), [tell = server.log, name = wanted.name](
                                                    const std::string& line) { tell(name + ": " + line); });
        }
        imported = &wanted;
        wanted.usedBy = peerText;
        server.Tell(wanted.name + ": opened by " + peerText);
        return {UsbIp::OperationStatus::Ok, wanted.Record(BusIdOf(wanted)), std::move(device)};
    }

  private:
    std::string BusIdOf(const Exported& each) const {
        return tcp ? each.BusId() : Platform::Usb::SimulatorBusId;
    }

    UsbIpServer& server;
    const std::vector<Exported*> offered;
    const std::string peerText;
    const bool tcp;
    Exported* imported = nullptr;
};

/// A connected socket with its session. Never waits for its peer.
class UsbIpServer::Connection final {
  public:
    Connection(UsbIpServer& ownServer, int connectedSocket, std::vector<Exported*> offered, bool tcp,
               const std::string& peer)
        : server(ownServer),
          file(connectedSocket),
          peerText(peer),
          exports(std::in_place, ownServer, std::move(offered), peer, tcp) {}
    ~Connection() {
        Abandon();
        session.reset();
        exports.reset();
        // The peer takes this for the sign that the instrument is free again.
        close(file);
    }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    /// Waits for what the peer wants.
    void Begin() {
        session = std::make_unique<UsbIpSession>(*exports, [this] { FlushSoon(); });
        Watch();
    }
    /// Begins with an instrument that the peer need not ask for; false when somebody else has it.
    bool BeginWith(Exported& wanted) {
        UsbIpExports::Import import = exports->Take(wanted);
        if (!import.device) {
            return false;
        }
        session = std::make_unique<UsbIpSession>(std::move(import.device), [this] { FlushSoon(); });
        Watch();
        return true;
    }
    /// No more is heard of it; it may be one of its own functions that is running.
    void Abandon() {
        abandoned = true;
        server.loop.Forget(flush);
        server.loop.Forget(deadline);
        server.loop.Unwatch(file);
    }

  private:
    void Watch() {
        short events = 0;
        if (session->WantsInput()) {
            events = static_cast<short>(events | POLLIN);
        }
        if (!session->Output().empty()) {
            events = static_cast<short>(events | POLLOUT);
        }
        if (events != watchedFor) {
            watchedFor = events;
            server.loop.Watch(file, events, [this] { Ready(); });
        }
        if (deadline == 0 && session->PeerIsDue()) {
            CheckPeerAt(server.loop.Now() + Patience);
        }
    }

    void CheckPeerAt(std::uint64_t time) {
        deadline = server.loop.CallAt(time, [this] {
            deadline = 0;
            if (!session->PeerIsDue()) {
                return;
            }
            if (lastMoved + Patience > server.loop.Now()) {
                CheckPeerAt(lastMoved + Patience);
                return;
            }
            server.Tell(peerText + ": silent for too long");
            server.Remove(*this);
        });
    }

    /// Not from inside the session, which is busy.
    void FlushSoon() {
        if (flush == 0 && !abandoned) {
            flush = server.loop.CallSoon([this] {
                flush = 0;
                Flush();
            });
        }
    }

    void Ready() {
        if (session->WantsInput() && inputStart == inputEnd) {
            const ssize_t count = recv(file, input.data(), input.size(), MSG_DONTWAIT);
            if (count == 0 || (count < 0 && errno != EAGAIN && errno != EINTR)) {
                server.Remove(*this);
                return;
            }
            lastMoved = server.loop.Now();
            inputStart = 0;
            inputEnd = static_cast<std::size_t>(std::max<ssize_t>(count, 0));
        }
        Flush();
    }

    /// Lets the session have what was received, and the peer what the session has for it, as far as it goes.
    void Flush() {
        do {
            inputStart += session->Receive(std::span(input).subspan(inputStart, inputEnd - inputStart));
            if (!SendOutput()) {
                server.Remove(*this);
                return;
            }
        } while (session->WantsInput() && inputStart < inputEnd);
        if (session->Over() && session->Output().empty()) {
            if (!session->Complaint().empty()) {
                server.Tell(peerText + ": " + session->Complaint());
            }
            server.Remove(*this);
            return;
        }
        Watch();
    }

    /// False when the peer is lost.
    bool SendOutput() {
        while (!session->Output().empty()) {
            const auto output = session->Output();
            const ssize_t count = send(file, output.data(), output.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
            if (count < 0 && errno != EINTR) {
                return errno == EAGAIN;
            }
            lastMoved = server.loop.Now();
            session->OutputSent(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
        }
        return true;
    }

    /// A peer that is due and moves no byte for so long is given up: it would keep its connection for ever.
    static constexpr std::uint64_t Patience = 5'000'000;

    UsbIpServer& server;
    const int file;
    const std::string peerText;
    std::optional<Exports> exports;
    std::unique_ptr<UsbIpSession> session;
    // Received and not taken yet. Its size bounds how long one peer keeps the others waiting.
    std::array<std::uint8_t, 65536> input{};
    std::size_t inputStart = 0;
    std::size_t inputEnd = 0;
    Platform::EventScheduler::EventId flush = 0;
    Platform::EventScheduler::EventId deadline = 0;
    std::uint64_t lastMoved = 0;  // when bytes went either way
    short watchedFor = -1;
    bool abandoned = false;
};

UsbIpServer::UsbIpServer(PollLoop& pollLoop, Log logger) : loop(pollLoop), log(std::move(logger)) {}

UsbIpServer::~UsbIpServer() {
    loop.Forget(cleaning);
    loop.Forget(relistening);
    removed.clear();
    connections.clear();
    for (const Listener& listener : listeners) {
        loop.Unwatch(listener.file);
        close(listener.file);
    }
}

void UsbIpServer::Tell(const std::string& line) const {
    if (log) {
        log(line);
    }
}

void UsbIpServer::Add(Export added) {
    if (!Platform::Usb::IsSimulatorName(added.name)) {
        throw std::runtime_error("\"" + added.name +
                                 "\" is no name: letters, digits, '-', '_' and '.', at most 64 of them");
    }
    const int file = Platform::Usb::ListenAsSimulator(added.name);
    if (file < 0 && errno == EADDRINUSE) {
        throw std::runtime_error("an instrument named \"" + added.name +
                                 "\" is already simulated; choose another --name");
    }
    if (file < 0) {
        Fail("cannot listen for \"" + added.name + "\"");
    }
    Exported& exported = exportedInstruments.emplace_back();
    static_cast<Export&>(exported) = std::move(added);
    exported.number = static_cast<std::uint32_t>(exportedInstruments.size());
    ListenTo(file, {&exported}, true);
}

std::uint16_t UsbIpServer::ListenTcp(std::uint16_t port) {
    const int file = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (file < 0) {
        Fail("no TCP socket");
    }
    const int on = 1;
    setsockopt(file, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof address;
    auto* const generic = reinterpret_cast<sockaddr*>(&address);
    constexpr int waitingConnections = 16;
    if (bind(file, generic, size) != 0 || listen(file, waitingConnections) != 0 ||
        getsockname(file, generic, &size) != 0) {
        const int error = errno;
        close(file);
        errno = error;
        Fail("cannot listen on TCP port " + std::to_string(port));
    }
    std::vector<Exported*> all;
    for (Exported& each : exportedInstruments) {
        all.push_back(&each);
    }
    ListenTo(file, std::move(all), false);
    return ntohs(address.sin_port);
}

UsbIpServer::Exported& UsbIpServer::Find(const std::string& name) {
    const auto found = std::ranges::find(exportedInstruments, name, &Exported::name);
    if (found == exportedInstruments.end()) {
        throw std::runtime_error("no instrument named \"" + name + "\"");
    }
    return *found;
}

UsbIp::DeviceRecord UsbIpServer::Record(const std::string& name) {
    const Exported& exported = Find(name);
    return exported.Record(exported.BusId());
}

void UsbIpServer::ListenTo(int file, std::vector<Exported*> offered, bool unixSocket) {
    fcntl(file, F_SETFL, O_NONBLOCK);
    listeners.push_back({file, unixSocket, std::move(offered)});
    Listen();
}

void UsbIpServer::Listen() {
    for (const Listener& listener : listeners) {
        loop.Watch(listener.file, POLLIN, [this, &listener] { Accept(listener); });
    }
}

void UsbIpServer::PauseListening() {
    constexpr std::uint64_t pause = 100'000;
    for (const Listener& listener : listeners) {
        loop.Unwatch(listener.file);
    }
    loop.Forget(relistening);
    relistening = loop.CallAt(loop.Now() + pause, [this] { Listen(); });
}

void UsbIpServer::Accept(const Listener& listener) {
    constexpr std::size_t mostConnections = 256;
    const int file = accept4(listener.file, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    if (file < 0) {
        if (errno != EAGAIN && errno != EINTR && errno != ECONNABORTED) {
            PauseListening();  // no file is left: one may be later
        }
        return;
    }
    std::string peer = "a TCP peer";
    if (listener.unixSocket) {
        const auto credentials = Platform::Usb::CredentialsOfPeer(file);
        if (!credentials || !Platform::Usb::IsTrustedUser(credentials->userId)) {
            Tell("refused a process of another user");
            close(file);
            return;
        }
        peer = DescribeProcess(credentials->processId);
    } else {
        const int on = 1;
        setsockopt(file, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    }
    if (connections.size() >= mostConnections) {
        close(file);
        return;
    }
    connections.push_back(
        std::make_unique<Connection>(*this, file, listener.offered, !listener.unixSocket, peer));
    connections.back()->Begin();
}

void UsbIpServer::Serve(int connectedSocket, const std::string& name, const std::string& peer) {
    fcntl(connectedSocket, F_SETFL, O_NONBLOCK);
    auto connection =
        std::make_unique<Connection>(*this, connectedSocket, std::vector<Exported*>(), false, peer);
    if (!connection->BeginWith(Find(name))) {
        throw std::runtime_error("\"" + name + "\" is in use");
    }
    connections.push_back(std::move(connection));
}

void UsbIpServer::Remove(Connection& connection) {
    const auto found =
        std::ranges::find_if(connections, [&](const auto& each) { return each.get() == &connection; });
    if (found == connections.end()) {
        return;
    }
    connection.Abandon();
    removed.splice(removed.end(), connections, found);
    if (cleaning == 0) {
        cleaning = loop.CallSoon([this] {
            cleaning = 0;
            removed.clear();
        });
    }
}

}  // namespace Varnholt::Simulator
