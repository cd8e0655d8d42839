#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"

/// The rows of a USB transcript.
namespace Varnholt::Tests {

using Bytes = std::vector<std::uint8_t>;

/// `count` bytes that tell their place: first, first + 1, ...
Bytes Counting(std::size_t count, unsigned first = 0);
/// "1F 00 A2"
std::string Hex(const std::uint8_t* bytes, std::size_t count);
/// A transfer as it stands in messages about rows.
std::string Describe(const Platform::Usb::Transfer& transfer);

/// One row. Made by the functions below, refined by its members:
///
///     VendorOut(0xCA, {0x1F})
///     BulkIn(256, Counting(256)).After(20'000)
///     BulkIn(512, Counting(512)).Ends(TransferStatus::Stalled, 100)
struct Exchange {
    enum class Kind { Transfer, ClearHalt };
    static constexpr std::uint64_t Never = ~std::uint64_t{0};

    Kind kind = Kind::Transfer;
    std::uint8_t endpoint = 0;
    Platform::Usb::SetupPacket setup;  ///< endpoint 0
    Bytes sent;                        ///< OUT: the data expected
    std::uint32_t length = 0;          ///< bytes asked for or sent

    Bytes received;  ///< IN: the answer
    Platform::Usb::TransferStatus status = Platform::Usb::TransferStatus::Completed;
    std::uint32_t moved = 0;  ///< bytes moved at completion
    std::uint32_t movedWhenCancelled = 0;
    Platform::ErrorCode refusal = Platform::Errors::Success;  ///< `Submit` or `ClearHalt` answers this
    std::uint64_t delay = 0;                                  ///< microseconds; 0: inside `Submit`

    /// Ends with this status after this many bytes.
    Exchange Ends(Platform::Usb::TransferStatus how, std::uint32_t bytes = 0) const {
        return With(&Exchange::status, how).With(&Exchange::moved, bytes);
    }
    /// Is not accepted, with this code.
    Exchange Refused(Platform::ErrorCode code) const { return With(&Exchange::refusal, code); }
    /// Completes that many microseconds after it was submitted, on the clock's scheduler.
    Exchange After(std::uint64_t microseconds) const { return With(&Exchange::delay, microseconds); }
    /// Is left to its cancellation.
    Exchange OnDemand() const { return With(&Exchange::delay, Never); }
    /// A cancellation finds that many bytes moved.
    Exchange MovesWhenCancelled(std::uint32_t bytes) const {
        return With(&Exchange::movedWhenCancelled, bytes);
    }

    bool IsIn() const { return endpoint == 0 ? setup.IsIn() : (endpoint & 0x80) != 0; }
    std::string Describe() const;

  private:
    template <class Value>
    Exchange With(Value Exchange::*member, Value value) const {
        Exchange row = *this;
        row.*member = value;
        return row;
    }
};

Exchange VendorOut(std::uint8_t request, Bytes data, std::uint16_t value = 0, std::uint16_t index = 0);
Exchange VendorIn(std::uint8_t request, std::uint16_t length, Bytes answer, std::uint16_t value = 0,
                  std::uint16_t index = 0);
Exchange BulkOut(Bytes data, std::uint8_t endpoint = Protocol::BulkOutEndpoint);
/// Also for the interrupt endpoint. An answer shorter than `length` is a short transfer.
Exchange BulkIn(std::uint32_t length, Bytes answer, std::uint8_t endpoint = Protocol::BulkInEndpoint);
/// The driver clears the halt of an endpoint.
Exchange HaltCleared(std::uint8_t endpoint);

}  // namespace Varnholt::Tests
