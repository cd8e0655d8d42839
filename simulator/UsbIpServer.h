#pragma once

#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <string>
#include <vector>

#include "FaultPlan.h"
#include "PollLoop.h"
#include "SimulatedInstrument.h"
#include "TransferLog.h"
#include "UsbIpConnection.h"
#include "UsbIpSession.h"

namespace Varnholt::Simulator {

/// Lets other processes use simulated instruments: each on a Unix socket of its own, and, when asked, all of
/// them on a TCP port of this machine. One import of an instrument at a time. Lives on the loop's thread.
class UsbIpServer final {
  public:
    /// Both must outlive the server. `logger` is told what happens; may be empty.
    UsbIpServer(PollLoop& pollLoop, Log logger);
    ~UsbIpServer();
    UsbIpServer(const UsbIpServer&) = delete;
    UsbIpServer& operator=(const UsbIpServer&) = delete;

    struct Export {
        std::string name;
        std::shared_ptr<SimulatedInstrument> instrument;
        FaultPlan faults;  ///< counted anew with each import
        /// Put around what is imported; may be empty.
        std::function<std::shared_ptr<Platform::Usb::UsbDevice>(std::shared_ptr<Platform::Usb::UsbDevice>)>
            wrap;
    };
    /// Adds an instrument and listens for it. Throws `std::runtime_error` with a text for people.
    void Add(Export added);

    /// Listens on 127.0.0.1; 0 takes a free port. Answers the port. Throws as above.
    std::uint16_t ListenTcp(std::uint16_t port);

    /// Serves a connected stream socket whose peer has nothing to import any more, such as a kernel; `peer`
    /// says who is there. Throws as above.
    void Serve(Platform::Linux::FileDescriptor connectedSocket, const std::string& name,
               const std::string& peer);

    /// How TCP peers find an instrument, and its device number.
    Platform::Usb::UsbIp::DeviceRecord Record(const std::string& name);

  private:
    struct Exported;
    class Exports;

    struct Listener {
        Platform::Linux::FileDescriptor file;
        bool unixSocket;
        std::vector<Exported*> offered;
    };

    void ListenTo(Platform::Linux::FileDescriptor file, std::vector<Exported*> offered, bool unixSocket);
    Exported& Find(const std::string& name);
    void Listen();
    void PauseListening();
    void Accept(const Listener& listener);
    /// Adds a connection; `imported` as `UsbIpConnection` has it.
    void Connect(Platform::Linux::FileDescriptor file, std::unique_ptr<Exports> exports,
                 std::shared_ptr<Platform::Usb::UsbDevice> imported, const std::string& peer);
    /// Ends a connection as soon as what is being called has returned: it may be one of its own functions.
    void Remove(UsbIpConnection& connection);
    void Tell(const std::string& line) const;

    PollLoop& loop_;
    const Log log_;
    std::list<Exported> exportedInstruments_;
    std::list<Listener> listeners_;
    std::list<std::unique_ptr<UsbIpConnection>> connections_;
};

}  // namespace Varnholt::Simulator
