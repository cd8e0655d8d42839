#pragma once

#include <cstdint>
#include <memory>
#include <new>
#include <span>
#include <utility>

#include "Platform/DeviceFiles.h"
#include "Platform/Drivers/SharedDevice.h"
#include "Platform/ErrorCodes.h"
#include "Platform/Usb/UsbDevice.h"

namespace Varnholt::Platform::Drivers {

/// What a driver makes of a request on one of its files.
struct Decision {
    enum class Kind {
        Refused,  ///< the request ends before it began, with `code`
        Done,     ///< finished without a transfer; `bytes` were moved
        Send,     ///< the transfer is filled in and goes to the device
    };
    Kind kind;
    ErrorCode code = Errors::Success;
    std::uint32_t bytes = 0;

    static Decision Refuse(ErrorCode code) { return {Kind::Refused, code, 0}; }
    static Decision Done(std::uint32_t bytes) { return {Kind::Done, Errors::Success, bytes}; }
    static Decision Send() { return {Kind::Send, Errors::Success, 0}; }
};

/// A driver's side of one open file: which requests it takes, what they become on the bus, and its codes. One
/// per handle; destroyed when the handle is closed and all its requests have completed. All operations may be
/// called from any thread.
class DriverFile {
  public:
    explicit DriverFile(std::shared_ptr<SharedDevice> shared) : device_(std::move(shared)) {}
    virtual ~DriverFile() = default;
    DriverFile(const DriverFile&) = delete;
    DriverFile& operator=(const DriverFile&) = delete;

    /// Decides on an operation, by one of the next two.
    Decision Decide(const Operation& operation, Usb::Transfer& transfer) {
        transfer.data = operation.data;
        transfer.length = operation.length;
        if (operation.kind != Operation::Kind::Control) {
            return Move(operation.kind == Operation::Kind::Read, transfer);
        }
        try {
            return Control(operation.code, operation.input, {operation.data, operation.length}, transfer);
        } catch (const std::bad_alloc&) {
            return Decision::Refuse(RefusalOf(Errors::NotEnoughMemory));
        } catch (...) {
            return Decision::Refuse(RefusalOf(Errors::GeneralFailure));
        }
    }
    /// Decides on a read (`in`) or write; buffer and length stand in `transfer`, which gets its endpoint. A
    /// read of no bytes completes at once and reaches no endpoint; a write of no bytes is sent as an empty
    /// packet. On the path of every transfer: must not block.
    virtual Decision Move(bool in, Usb::Transfer& transfer) = 0;
    /// Decides on a device control, or carries it out. `output` is the data stage of a vendor request in
    /// either direction. May block where the device is set up.
    virtual Decision Control(std::uint32_t code, std::span<const std::uint8_t> input,
                             std::span<std::uint8_t> output, Usb::Transfer& transfer) = 0;

    /// The driver's code for how a transfer ended, and for a request that the USB device refused.
    virtual ErrorCode OutcomeOf(Usb::TransferStatus status) const = 0;
    virtual ErrorCode RefusalOf(ErrorCode usbCode) const = 0;

    /// Milliseconds after which the driver gives up a transfer that its callers wait for without a limit of
    /// their own, and the code it then ends with. 0: never.
    virtual std::uint32_t TimeLimitOf(const Usb::Transfer& /*transfer*/) const { return 0; }
    virtual ErrorCode TimedOutCode() const { return Errors::SemaphoreTimeout; }

    SharedDevice& Device() const { return *device_; }

  protected:
    Decision Abort(std::uint8_t endpoint) const {
        device_->AbortEndpoint(endpoint);
        return Decision::Done(0);
    }

  private:
    const std::shared_ptr<SharedDevice> device_;
};

}  // namespace Varnholt::Platform::Drivers
