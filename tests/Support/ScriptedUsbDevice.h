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
    void CancelLater(bool later) { Set(cancelLater, later); }
    /// Pending transfers end with `DeviceGone`; nothing is accepted any more.
    void Unplug();
    /// What `Claim` answers from now on.
    void AnswerClaim(Platform::ErrorCode code) { Set(claimAnswer, code); }
    /// Whether `Endpoints` succeeds from now on.
    void AnswerEndpoints(Platform::ErrorCode code) { Set(endpointsAnswer, code); }

    bool IsClaimed() const { return Get(claimed); }
    bool IsOpen() const { return Get(handles) > 0; }
    std::uint32_t TimesOpened() const { return Get(timesOpened); }
    std::uint32_t TimesClaimed() const { return Get(timesClaimed); }
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
        const std::lock_guard guard(lock);
        return member;
    }
    template <class Value>
    void Set(Value& member, Value value) {
        const std::lock_guard guard(lock);
        member = value;
    }
    bool Matches(const Exchange& row, const Platform::Usb::Transfer& transfer) const;
    void Mismatch(const std::string& actual);
    void CompleteReady(std::uint8_t endpoint);
    void CompleteLater(std::uint64_t number, std::uint64_t delay);
    static void Finish(const Running& completed);

    mutable std::mutex lock;  // guards all that follows; not held while others are called
    std::deque<Exchange> script;
    std::size_t played = 0;
    bool failed = false;
    std::deque<Running> running;  // oldest first
    std::uint64_t lastNumber = 0;
    std::vector<std::uint64_t> events;
    std::set<std::uint8_t> leftToTest;
    std::deque<std::pair<std::uint8_t, Bytes>> unsent;
    std::set<std::uint8_t> halted;
    bool cancelLater = false;
    bool gone = false;
    bool claimed = false;
    std::uint32_t handles = 0;
    std::uint32_t timesOpened = 0;
    std::uint32_t timesClaimed = 0;
    Platform::ErrorCode claimAnswer = Platform::Errors::Success;
    Platform::ErrorCode endpointsAnswer = Platform::Errors::Success;
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

    std::mutex lock;
    Devices devices;
    Platform::ErrorCode openAnswer = Platform::Errors::Success;
};

}  // namespace Varnholt::Tests
