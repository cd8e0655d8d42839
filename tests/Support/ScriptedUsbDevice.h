#pragma once

#include <atomic>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"
#include "Support/Bytes.h"

/// A USB device that plays a table: each row is a transfer expected and the answer to it. A transfer that
/// does not match its row fails the test with both sides as hex.
namespace Varnholt::Tests {

/// One row. Made by the functions below, refined by its members:
///
///     VendorOut(0xCA, {0x1F})
///     BulkIn(256, Counting(256)).After(20'000)
///     BulkIn(512, Counting(512)).Ends(TransferStatus::Stalled, 100)
struct Exchange {
    static constexpr std::uint64_t Never = ~std::uint64_t{0};

    std::string expected;  ///< endpoint, setup packet, length and data sent
    Bytes received;        ///< IN: the answer
    Platform::Usb::TransferStatus status = Platform::Usb::TransferStatus::Completed;
    std::uint32_t moved = 0;  ///< bytes moved at completion
    std::uint32_t movedWhenCancelled = 0;
    Platform::ErrorCode refusal = Platform::Errors::Success;  ///< `Submit` or `ClearHalt` answers this
    std::uint64_t delay = 0;                                  ///< microseconds; 0: inside `Submit`

    /// Ends with this status after this many bytes.
    Exchange Ends(Platform::Usb::TransferStatus how, std::uint32_t bytes = 0) const {
        return With(&Exchange::status, how).With(&Exchange::moved, bytes);
    }
    Exchange Refused(Platform::ErrorCode code) const { return With(&Exchange::refusal, code); }
    /// Completes that many microseconds after it was submitted, on the clock's scheduler.
    Exchange After(std::uint64_t microseconds) const { return With(&Exchange::delay, microseconds); }
    /// Is left to its cancellation.
    Exchange OnDemand() const { return After(Never); }
    Exchange MovesWhenCancelled(std::uint32_t bytes) const {
        return With(&Exchange::movedWhenCancelled, bytes);
    }

  private:
    template <class Value>
    Exchange With(Value Exchange::*member, Value value) const {
        Exchange row = *this;
        row.*member = value;
        return row;
    }
};

Exchange ControlOut(const Platform::Usb::SetupPacket& setup, const Bytes& data);
Exchange VendorOut(std::uint8_t request, const Bytes& data, std::uint16_t value = 0, std::uint16_t index = 0);
Exchange VendorIn(std::uint8_t request, std::uint16_t length, Bytes answer);
Exchange BulkOut(const Bytes& data);
/// Also for the interrupt endpoint. An answer shorter than `length` is a short transfer.
Exchange BulkIn(std::uint32_t length, Bytes answer, std::uint8_t endpoint = Protocol::BulkInEndpoint);
/// The driver clears the halt of an endpoint.
Exchange HaltCleared(std::uint8_t endpoint);

/// The order of submission is the order of the table. All operations may be called from any thread. A device
/// that the test has unplugged refuses everything.
class ScriptedUsbDevice final : public Platform::Usb::UsbDevice {
  public:
    explicit ScriptedUsbDevice(std::vector<Exchange> rows = {});
    /// Fails the test if rows are left.
    ~ScriptedUsbDevice() override;

    /// Appends rows.
    void Expect(std::vector<Exchange> rows);
    /// Transfers on this endpoint are no rows: they stay pending until `Send`, a cancellation or the end.
    void LeaveToTest(std::uint8_t endpoint);
    /// Answers the oldest transfer on an endpoint left to the test, or the next one.
    void Send(std::uint8_t endpoint, Bytes data);
    /// Cancellations complete later, on the clock's scheduler, instead of inside `Cancel`.
    void CancelLater(bool later) { cancelLater_ = later; }
    /// Pending transfers end with `DeviceGone`; nothing is accepted any more.
    void Unplug();
    /// What `Claim` and `Endpoints` answer from now on.
    void AnswerClaim(Platform::ErrorCode code) { claimAnswer_ = code; }
    void AnswerEndpoints(Platform::ErrorCode code) { endpointsAnswer_ = code; }

    bool IsClaimed() const { return isClaimed_; }
    bool IsOpen() const { return handles_ > 0; }
    std::uint32_t TimesOpened() const { return timesOpened_; }
    std::uint32_t TimesClaimed() const { return timesClaimed_; }
    std::size_t Pending(std::uint8_t endpoint) const;

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override;
    Platform::ErrorCode Claim() override;
    void Release() override { isClaimed_ = false; }
    Platform::ErrorCode Submit(Platform::Usb::Transfer& transfer) override;
    void Cancel(Platform::Usb::Transfer& transfer) override;
    Platform::ErrorCode ClearHalt(std::uint8_t endpoint) override;

    /// A handle to `device` as a bus hands it out: notes when it is opened and closed.
    static std::shared_ptr<Platform::Usb::UsbDevice> OpenHandle(
        const std::shared_ptr<ScriptedUsbDevice>& device);

  private:
    struct Running {
        std::uint64_t number;
        Platform::Usb::Transfer* transfer;
        Exchange row;
        bool isCancelled = false;
    };

    /// The next row, with the lock held; one that does not match fails the test.
    Exchange TakeRow(const std::string& actual);
    void Complete(std::uint64_t number);
    void CompleteLater(std::uint64_t number, std::uint64_t delay);
    static void Finish(const Running& completed);

    mutable std::mutex lock_;  // guards what follows up to `gone_`; not held while others are called
    std::deque<Exchange> script_;
    std::size_t played_ = 0;
    bool failed_ = false;
    std::deque<Running> running_;  // oldest first
    std::uint64_t lastNumber_ = 0;
    std::vector<std::uint64_t> events_;
    std::set<std::uint8_t> leftToTest_;
    std::map<std::uint8_t, Bytes> unsent_;
    bool gone_ = false;

    std::atomic<bool> cancelLater_ = false, isClaimed_ = false;
    std::atomic<std::uint32_t> handles_ = 0, timesOpened_ = 0, timesClaimed_ = 0;
    std::atomic<Platform::ErrorCode> claimAnswer_ = Platform::Errors::Success;
    std::atomic<Platform::ErrorCode> endpointsAnswer_ = Platform::Errors::Success;
};

/// A bus with such devices, in the order in which they were plugged in. One thread.
class ScriptedBus final : public Platform::Usb::UsbBus {
  public:
    void Plug(const std::string& name, std::shared_ptr<ScriptedUsbDevice> device) {
        devices_.emplace_back(name, std::move(device));
    }
    /// Takes the device off the list and unplugs it.
    void Unplug(const std::string& name);
    /// What `Open` answers from now on, unless success.
    void AnswerOpen(Platform::ErrorCode code) { openAnswer_ = code; }

    std::vector<std::string> List() override;
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string& name,
                                                   Platform::ErrorCode& error) override;

  private:
    std::vector<std::pair<std::string, std::shared_ptr<ScriptedUsbDevice>>> devices_;
    Platform::ErrorCode openAnswer_ = Platform::Errors::Success;
};

}  // namespace Varnholt::Tests
