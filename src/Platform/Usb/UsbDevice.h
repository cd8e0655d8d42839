#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "Platform/CompletionSource.h"
#include "Platform/ErrorCodes.h"

/// A USB device with asynchronous, cancellable transfers: what the driver behaviour stands on where the
/// operating system has no driver for the instrument. Implemented by real USB, by the USB/IP client and by
/// the simulated instrument itself.
namespace Varnholt::Platform::Usb {

enum class TransferStatus {
    Completed,
    Stalled,   ///< the endpoint answered with STALL; it stays halted until `ClearHalt` (endpoint 0: until the
               ///< next setup)
    IoError,   ///< bus error
    Overflow,  ///< the device sent more than was asked for
    Cancelled,   ///< by `Cancel`; data may have moved all the same
    DeviceGone,  ///< unplugged, or the connection to it is lost
};

/// The eight setup bytes of a control transfer.
struct SetupPacket {
    std::uint8_t requestType = 0;
    std::uint8_t request = 0;
    std::uint16_t value = 0;
    std::uint16_t index = 0;
    std::uint16_t length = 0;

    bool IsIn() const { return (requestType & 0x80) != 0; }
    bool IsStandard() const { return (requestType & 0x60) == 0; }
    bool IsVendor() const { return (requestType & 0x60) == 0x40; }
    bool operator==(const SetupPacket&) const = default;
};

class TransferClient;

/// One transfer. The submitter owns it and its buffer and keeps both alive until `TransferCompleted` was
/// called.
struct Transfer {
    std::uint8_t endpoint = 0;  ///< 0 for control, 0x80 set for IN
    SetupPacket setup;          ///< control transfers only
    std::uint8_t* data = nullptr;
    std::uint32_t length = 0;  ///< control: equal to `setup.length`
    TransferClient* client = nullptr;

    // Set by the device before completion.
    TransferStatus status = TransferStatus::Completed;
    std::uint32_t actualLength = 0;  ///< bytes moved, at most `length`; valid with every status
    void* deviceData = nullptr;      ///< for the device's own bookkeeping while the transfer runs

    bool IsIn() const { return endpoint == 0 ? setup.IsIn() : (endpoint & 0x80) != 0; }
    /// Makes it a control transfer with this data stage.
    void MakeControl(const SetupPacket& packet, std::span<std::uint8_t> dataStage) {
        endpoint = 0;
        setup = packet;
        setup.length = static_cast<std::uint16_t>(dataStage.size());
        data = dataStage.data();
        length = setup.length;
    }
};

class TransferClient {
  public:
    virtual ~TransferClient() = default;
    /// Called exactly once for each accepted transfer, on any thread, also from inside `Submit` or `Cancel`;
    /// the device holds no lock of its own meanwhile, and touches the transfer no more.
    virtual void TransferCompleted(Transfer& transfer) noexcept = 0;
};

struct EndpointInfo {
    std::uint8_t address;
    std::uint8_t attributes;  ///< as in the endpoint descriptor: 2 bulk, 3 interrupt
    std::uint16_t maximumPacketSize;
};

/// All operations may be called from any thread. Codes are those of `Errors`.
class UsbDevice {
  public:
    /// Closes the device: transfers still running complete first.
    virtual ~UsbDevice() = default;

    /// The endpoints of configuration 1, interface 0, alternate setting 0, of a claimed device. Empty when
    /// they cannot be found out, with the reason in `error`.
    virtual std::vector<EndpointInfo> Endpoints(ErrorCode& error) = 0;

    /// Makes the device this process's own with its only configuration and interface; `Errors::Busy` when
    /// another process has it, `Errors::AccessDenied` without permission, `Errors::DeviceNotConnected` when
    /// it is gone.
    virtual ErrorCode Claim() = 0;
    /// Gives the claim back. Harmless without one.
    virtual void Release() = 0;

    /// Starts a transfer. Any code but `Errors::Success` means that it was not accepted and does not
    /// complete.
    virtual ErrorCode Submit(Transfer& transfer) = 0;
    /// Asks for the end of a transfer, which completes in bounded time with `Cancelled` or what it had
    /// reached. A transfer that has completed is left alone; it must still be alive.
    virtual void Cancel(Transfer& transfer) = 0;

    virtual ErrorCode ClearHalt(std::uint8_t endpoint) = 0;

    /// Where the ends of transfers on `endpoint` come from, for threads that wait for one. Null where that
    /// makes no difference.
    virtual std::shared_ptr<CompletionSource> CompletionsOf(std::uint8_t /*endpoint*/) { return nullptr; }
};

/// Where instruments are plugged in.
class UsbBus {
  public:
    virtual ~UsbBus() = default;
    /// The names of the instruments that are present, in a stable order. A name says where the instrument is
    /// plugged in and survives replugging; it has no slash or backslash.
    virtual std::vector<std::string> List() = 0;
    /// Whether an instrument of that name is present. A bus that need not look for all of them does not.
    virtual bool Has(const std::string& name) {
        const std::vector<std::string> names = List();
        return std::find(names.begin(), names.end(), name) != names.end();
    }
    /// Null on failure with the code in `error`. Opening does not claim the device.
    virtual std::shared_ptr<UsbDevice> Open(const std::string& name, ErrorCode& error) = 0;
};

}  // namespace Varnholt::Platform::Usb
