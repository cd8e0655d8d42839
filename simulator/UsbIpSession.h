#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Platform/Usb/UsbIpProtocol.h"

namespace Varnholt::Simulator {

/// What a USB/IP peer can see and import.
class UsbIpExports {
  public:
    virtual ~UsbIpExports() = default;

    virtual std::vector<Platform::Usb::UsbIp::DeviceRecord> List() = 0;
    struct Import {
        Platform::Usb::UsbIp::OperationStatus status{};
        Platform::Usb::UsbIp::DeviceRecord record;
        std::shared_ptr<Platform::Usb::UsbDevice> device;  ///< claimed; when the status is `Ok`
    };
    virtual Import ImportDevice(const std::string& busId) = 0;
};

/// One USB/IP connection, seen from the side that has the devices, without the socket: bytes in, bytes out.
/// The peer may send anything. One thread.
class UsbIpSession final : private Platform::Usb::TransferClient {
  public:
    /// `exportedDevices` must outlive the session. `outputReady` is called when there are new bytes to send
    /// or the session is over; it must not destroy the session.
    UsbIpSession(UsbIpExports& exportedDevices, std::function<void()> outputReady);
    /// Begins after the import, as on a socket that was handed to a kernel.
    UsbIpSession(std::shared_ptr<Platform::Usb::UsbDevice> importedDevice, std::function<void()> outputReady);
    ~UsbIpSession() override;
    UsbIpSession(const UsbIpSession&) = delete;
    UsbIpSession& operator=(const UsbIpSession&) = delete;

    /// Answers how many of the bytes it has taken; it stops where `WantsInput` becomes false.
    std::size_t Receive(std::span<const std::uint8_t> bytes);

    std::span<const std::uint8_t> Output() const { return std::span(output_).subspan(sent_); }
    void OutputSent(std::size_t count);
    /// False while the peer should first take what there is for it.
    bool WantsInput() const { return !over_ && Output().size() < MostOutput; }

    /// Nothing is received any more; to be closed as soon as there is no output.
    bool Over() const { return over_; }
    /// Why it ended, for a log; empty while it runs and when it ended as it should.
    const std::string& Complaint() const { return complaint_; }
    /// Whether the peer has to go on soon: it may only be silent between two messages after an import.
    bool PeerIsDue() const {
        return over_ || !device_ || !input_.empty() || next_ == &UsbIpSession::SubmitPacket;
    }

  private:
    struct Urb;

    static constexpr std::size_t MostOutput = 4U << 20;
    static constexpr std::size_t MostTransfers = 1024;
    static constexpr std::uint64_t MostPendingBytes = 64U << 20;

    void HandleOperation();
    void HandleImport();
    void HandlePacketHeader();
    void Expect(void (UsbIpSession::*handler)(), std::size_t bytes);
    void SendDeviceList();
    void SubmitPacket();
    void Unlink(const Platform::Usb::UsbIp::UnlinkPacket& packet);
    void TransferCompleted(Platform::Usb::Transfer& transfer) noexcept override;
    void Send(std::span<const std::uint8_t> bytes);
    void End(const std::string& reason = {});

    UsbIpExports* const exports_;
    const std::function<void()> notify_;
    std::shared_ptr<Platform::Usb::UsbDevice> device_;

    // The message, or the part of one, that is being collected, and what it is for.
    std::vector<std::uint8_t> input_;
    std::size_t expected_ = 0;
    void (UsbIpSession::*next_)() = nullptr;
    Platform::Usb::UsbIp::SubmitPacket submit_;  // whose payload is being collected

    std::map<std::uint32_t, std::unique_ptr<Urb>> urbs_;  // by sequence number
    std::uint64_t pendingBytes_ = 0;

    std::vector<std::uint8_t> output_;
    std::size_t sent_ = 0;  // of `output`
    bool over_ = false;
    std::string complaint_;
};

}  // namespace Varnholt::Simulator
