#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "Alarm.h"
#include "Platform/Linux/FileDescriptor.h"
#include "PollLoop.h"
#include "UsbIpSession.h"

namespace Varnholt::Simulator {

/// A connected stream socket and the session on it. Never waits for its peer. Lives on the loop's thread.
class UsbIpConnection final {
  public:
    /// The connection is over, for a reason that is empty when it ended as it should. Called once, by one of
    /// the connection's own functions: it is to be destroyed later.
    using Over = std::function<void(UsbIpConnection& connection, const std::string& complaint)>;

    /// The socket does not block; `offered` is what the peer can import. `imported` is a claimed device that
    /// the peer need not ask for; null where it has to. The loop must outlive it.
    UsbIpConnection(PollLoop& pollLoop, Platform::Linux::FileDescriptor connectedSocket,
                    std::unique_ptr<UsbIpExports> offered, std::shared_ptr<Platform::Usb::UsbDevice> imported,
                    Over whenOver);
    ~UsbIpConnection() { StopListening(); }
    UsbIpConnection(const UsbIpConnection&) = delete;
    UsbIpConnection& operator=(const UsbIpConnection&) = delete;

  private:
    void Watch();
    void CheckPeer();
    void FlushSoon();
    void Ready();
    void Flush();
    bool SendOutput();
    void StopListening();
    void End(const std::string& complaint = {});

    PollLoop& loop_;
    /// Closed last: the peer takes that for the sign that the instrument is free again.
    const Platform::Linux::FileDescriptor file_;
    std::unique_ptr<UsbIpExports> exports_;
    const Over over_;
    // Received and not taken yet. Its size bounds how long one peer keeps the others waiting.
    std::array<std::uint8_t, 65536> input_{};
    std::size_t inputStart_ = 0;
    std::size_t inputEnd_ = 0;
    std::uint64_t lastMoved_ = 0;  // when bytes went either way
    short watchedFor_ = -1;
    bool ended_ = false;
    Alarm peerCheck_;
    Alarm flushing_;
    UsbIpSession session_;  ///< ends first
};

}  // namespace Varnholt::Simulator
