#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <optional>
#include <span>

#include "Platform/Linux/FileDescriptor.h"

namespace Varnholt::Platform::Usb {

/// A connected stream socket whose peer is not trusted to read or to write: every wait for it ends. Once an
/// operation has failed the connection is of no use any more.
class UsbIpSocket final {
  public:
    using Clock = std::chrono::steady_clock;

    /// Takes the file descriptor over.
    explicit UsbIpSocket(int socketFile);

    /// Sends both parts. False when the connection is lost or the peer does not take them in time. One thread
    /// at a time.
    bool Send(std::span<const std::uint8_t> header, std::span<const std::uint8_t> payload);

    /// Fills `bytes`. The first byte of a message may take as long as it likes; `inMessage` says that more of
    /// a message is to come, which has to come soon. One thread at a time.
    bool Receive(std::span<std::uint8_t> bytes, bool inMessage);
    /// From then on `Receive` fails, whatever it waits for; nothing takes the limit away. Any thread.
    void ReceiveUntil(std::optional<Clock::time_point> time);

    /// Tells the peer that nothing more will be sent. Any thread.
    void ShutdownSending();
    /// Makes every operation fail, also one that waits. Any thread.
    void Shutdown();

  private:
    bool LimitHasPassed() const;
    bool WaitToReceive(std::optional<Clock::time_point> patienceEnds) const;

    const Linux::FileDescriptor file_;
    const Linux::FileDescriptor limit_;  // a timer, readable once the limit has passed

    // Bytes received and not asked for yet; small messages then take one call of the system.
    std::array<std::uint8_t, 4096> buffer_{};
    std::size_t bufferStart_ = 0;
    std::size_t bufferEnd_ = 0;
};

}  // namespace Varnholt::Platform::Usb
