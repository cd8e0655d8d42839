#pragma once

#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "Platform/Usb/UsbDevice.h"
#include "Support/Exchange.h"

/// A USB device that plays a table: each row is a transfer expected and the answer to it. A transfer that
/// does not match its row fails the test with both sides as hex.
namespace Varnholt::Tests {

/// The order of submission is the order of the table; transfers of one endpoint complete in that order. All
/// operations may be called from any thread. A device that the test has unplugged refuses everything.
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
    void CancelLater(bool later) { Set(cancelLater_, later); }
    /// Pending transfers end with `DeviceGone`; nothing is accepted any more.
    void Unplug();
    /// What `Claim` answers from now on.
    void AnswerClaim(Platform::ErrorCode code) { Set(claimAnswer_, code); }
    /// Whether `Endpoints` succeeds from now on.
    void AnswerEndpoints(Platform::ErrorCode code) { Set(endpointsAnswer_, code); }

    bool IsClaimed() const { return Get(claimed_); }
    bool IsOpen() const { return Get(handles_) > 0; }
    std::uint32_t TimesOpened() const { return Get(timesOpened_); }
    std::uint32_t TimesClaimed() const { return Get(timesClaimed_); }
    std::size_t Pending(std::uint8_t endpoint) const;

    std::vector<Platform::Usb::EndpointInfo> Endpoints(Platform::ErrorCode& error) override;
    Platform::ErrorCode Claim() override;
    void Release() override;
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
        bool ready;      ///< completes as soon as it is the oldest of its endpoint
        bool cancelled;  ///< completes out of order
    };

    template <class Value>
    Value Get(const Value& member) const {
        const std::lock_guard guard(lock_);
        return member;
    }
    template <class Value>
    void Set(Value& member, Value value) {
        const std::lock_guard guard(lock_);
        member = value;
    }
    bool Matches(const Exchange& row, const Platform::Usb::Transfer& transfer) const;
    void Mismatch(const std::string& actual);
    void CompleteReady(std::uint8_t endpoint);
    void CompleteLater(std::uint64_t number, std::uint64_t delay);
    static void Finish(const Running& completed);

    mutable std::mutex lock_;  // guards all that follows; not held while others are called
    std::deque<Exchange> script_;
    std::size_t played_ = 0;
    bool failed_ = false;
    std::deque<Running> running_;  // oldest first
    std::uint64_t lastNumber_ = 0;
    std::vector<std::uint64_t> events_;
    std::set<std::uint8_t> leftToTest_;
    std::deque<std::pair<std::uint8_t, Bytes>> unsent_;
    std::set<std::uint8_t> halted_;
    bool cancelLater_ = false;
    bool gone_ = false;
    bool claimed_ = false;
    std::uint32_t handles_ = 0;
    std::uint32_t timesOpened_ = 0;
    std::uint32_t timesClaimed_ = 0;
    Platform::ErrorCode claimAnswer_ = Platform::Errors::Success;
    Platform::ErrorCode endpointsAnswer_ = Platform::Errors::Success;
};

/// A bus with such devices, in the order in which they were plugged in.
class ScriptedBus final : public Platform::Usb::UsbBus {
  public:
    void Plug(const std::string& name, std::shared_ptr<ScriptedUsbDevice> device);
    /// Takes the device off the list and unplugs it.
    void Unplug(const std::string& name);
    /// What `Open` answers from now on, unless success.
    void AnswerOpen(Platform::ErrorCode code);

    std::vector<std::string> List() override;
    std::shared_ptr<Platform::Usb::UsbDevice> Open(const std::string& name,
                                                   Platform::ErrorCode& error) override;

  private:
    using Devices = std::vector<std::pair<std::string, std::shared_ptr<ScriptedUsbDevice>>>;
    Devices::iterator FindDevice(const std::string& name);

    std::mutex lock_;
    Devices devices_;
    Platform::ErrorCode openAnswer_ = Platform::Errors::Success;
};

}  // namespace Varnholt::Tests
