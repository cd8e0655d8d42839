#include "Support/ScriptedUsbDevice.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "Platform/EventScheduler.h"

namespace Varnholt::Tests {

using Platform::ErrorCode;
using Platform::Usb::SetupPacket;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
namespace Errors = Platform::Errors;

namespace {

std::string Describe(std::uint8_t endpoint, const SetupPacket& setup, bool isIn, const std::uint8_t* data,
                     std::uint32_t length) {
    std::string text = Hex(&endpoint, 1);
    if (endpoint == 0) {
        const auto low = [](std::uint16_t number) { return static_cast<std::uint8_t>(number); };
        const auto high = [](std::uint16_t number) { return static_cast<std::uint8_t>(number >> 8U); };
        const std::uint8_t bytes[] = {setup.requestType, setup.request,     low(setup.value),
                                      high(setup.value), low(setup.index),  high(setup.index),
                                      low(setup.length), high(setup.length)};
        text += " setup " + Hex(bytes, sizeof bytes);
    }
    return text + " length " + std::to_string(length) + (isIn ? "" : " data " + Hex(data, length));
}

Exchange Out(std::uint8_t endpoint, const SetupPacket& setup, const Bytes& data) {
    const auto length = static_cast<std::uint32_t>(data.size());
    Exchange row;
    row.expected = Describe(endpoint, setup, false, data.data(), length);
    row.moved = length;
    return row;
}

Exchange In(std::uint8_t endpoint, const SetupPacket& setup, std::uint32_t length, Bytes answer) {
    Exchange row;
    row.expected = Describe(endpoint, setup, true, nullptr, length);
    row.moved = std::min(length, static_cast<std::uint32_t>(answer.size()));
    row.received = std::move(answer);
    return row;
}

}  // namespace

Exchange ControlOut(const SetupPacket& setup, const Bytes& data) {
    return Out(0, setup, data);
}

Exchange VendorOut(std::uint8_t request, const Bytes& data, std::uint16_t value, std::uint16_t index) {
    return ControlOut({Protocol::VendorOut, request, value, index, static_cast<std::uint16_t>(data.size())},
                      data);
}

Exchange VendorIn(std::uint8_t request, std::uint16_t length, Bytes answer) {
    return In(0, {Protocol::VendorIn, request, 0, 0, length}, length, std::move(answer));
}

Exchange BulkOut(const Bytes& data) {
    return Out(Protocol::BulkOutEndpoint, {}, data);
}

Exchange BulkIn(std::uint32_t length, Bytes answer, std::uint8_t endpoint) {
    return In(endpoint, {}, length, std::move(answer));
}

Exchange HaltCleared(std::uint8_t endpoint) {
    Exchange row;
    row.expected = "clear halt of " + Hex(&endpoint, 1);
    return row;
}

ScriptedUsbDevice::ScriptedUsbDevice(std::vector<Exchange> rows) {
    Expect(std::move(rows));
}

ScriptedUsbDevice::~ScriptedUsbDevice() {
    for (const std::uint64_t event : events_) {
        Platform::ClockScheduler().Forget(event);
    }
    Unplug();
    if (!script_.empty() && !failed_) {
        ADD_FAILURE() << script_.size() << " rows of the script were not played; the next, row " << played_
                      << ":\n  expected: " << script_.front().expected;
    }
}

void ScriptedUsbDevice::Expect(std::vector<Exchange> rows) {
    const std::lock_guard guard(lock_);
    std::ranges::move(rows, std::back_inserter(script_));
}

void ScriptedUsbDevice::LeaveToTest(std::uint8_t endpoint) {
    const std::lock_guard guard(lock_);
    leftToTest_.insert(endpoint);
}

void ScriptedUsbDevice::Send(std::uint8_t endpoint, Bytes data) {
    std::uint64_t number = 0;
    {
        const std::lock_guard guard(lock_);
        const auto oldest = std::ranges::find(
            running_, endpoint, [](const Running& candidate) { return candidate.transfer->endpoint; });
        if (oldest == running_.end()) {
            unsent_[endpoint] = std::move(data);
            return;
        }
        oldest->row = BulkIn(oldest->transfer->length, std::move(data), endpoint);
        number = oldest->number;
    }
    Complete(number);
}

void ScriptedUsbDevice::Unplug() {
    std::deque<Running> ended;
    {
        const std::lock_guard guard(lock_);
        gone_ = true;
        ended.swap(running_);
    }
    for (Running& transfer : ended) {
        transfer.row = transfer.row.Ends(TransferStatus::DeviceGone);
        Finish(transfer);
    }
}

std::size_t ScriptedUsbDevice::Pending(std::uint8_t endpoint) const {
    const std::lock_guard guard(lock_);
    return static_cast<std::size_t>(std::ranges::count(
        running_, endpoint, [](const Running& candidate) { return candidate.transfer->endpoint; }));
}

std::vector<Platform::Usb::EndpointInfo> ScriptedUsbDevice::Endpoints(ErrorCode& error) {
    error = endpointsAnswer_;
    if (error != Errors::Success) {
        return {};
    }
    return {{Protocol::BulkOutEndpoint, 2, 512},
            {Protocol::BulkInEndpoint, 2, 512},
            {Protocol::InterruptInEndpoint, 3, 8}};
}

ErrorCode ScriptedUsbDevice::Claim() {
    const std::lock_guard guard(lock_);
    const ErrorCode answer = gone_ ? Errors::DeviceNotConnected : claimAnswer_.load();
    if (answer == Errors::Success) {
        isClaimed_ = true;
        ++timesClaimed_;
    }
    return answer;
}

ErrorCode ScriptedUsbDevice::Submit(Transfer& transfer) {
    std::uint64_t number = 0;
    std::uint64_t delay = 0;
    {
        const std::lock_guard guard(lock_);
        if (gone_) {
            return Errors::DeviceNotConnected;
        }
        Exchange row;
        if (!leftToTest_.contains(transfer.endpoint)) {
            row = TakeRow(
                Describe(transfer.endpoint, transfer.setup, transfer.IsIn(), transfer.data, transfer.length));
        } else if (auto sent = unsent_.extract(transfer.endpoint)) {
            row = BulkIn(transfer.length, std::move(sent.mapped()), transfer.endpoint);
        } else {
            row = row.OnDemand();
        }
        if (row.refusal != Errors::Success) {
            return row.refusal;
        }
        number = ++lastNumber_;
        delay = row.delay;
        running_.push_back({number, &transfer, std::move(row)});
    }
    if (delay == 0) {
        Complete(number);
    } else if (delay != Exchange::Never) {
        CompleteLater(number, delay);
    }
    return Errors::Success;
}

void ScriptedUsbDevice::Cancel(Transfer& transfer) {
    std::uint64_t number = 0;
    {
        const std::lock_guard guard(lock_);
        const auto found = std::ranges::find(running_, &transfer, &Running::transfer);
        if (found == running_.end() || found->isCancelled) {
            return;
        }
        found->row = found->row.Ends(TransferStatus::Cancelled, found->row.movedWhenCancelled);
        found->isCancelled = true;
        number = found->number;
    }
    cancelLater_ ? CompleteLater(number, 0) : Complete(number);
}

ErrorCode ScriptedUsbDevice::ClearHalt(std::uint8_t endpoint) {
    const std::lock_guard guard(lock_);
    return gone_ ? Errors::DeviceNotConnected : TakeRow(HaltCleared(endpoint).expected).refusal;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedUsbDevice::OpenHandle(
    const std::shared_ptr<ScriptedUsbDevice>& device) {
    ++device->handles_;
    ++device->timesOpened_;
    return {device.get(), [device](Platform::Usb::UsbDevice*) {
                const std::lock_guard closing(device->lock_);
                if (--device->handles_ == 0) {
                    device->isClaimed_ = false;
                    EXPECT_TRUE(device->running_.empty()) << "the device was closed while transfers ran";
                }
            }};
}

Exchange ScriptedUsbDevice::TakeRow(const std::string& actual) {
    Exchange row;
    if (script_.empty() || script_.front().expected != actual) {
        if (!std::exchange(failed_, true)) {  // one difference makes all that follow differ
            ADD_FAILURE() << "row " << played_ << " of the script differs\n  expected: "
                          << (script_.empty() ? "nothing more" : script_.front().expected)
                          << "\n  actual:   " << actual;
        }
        row.status = TransferStatus::Stalled;
        return row;
    }
    row = std::move(script_.front());
    script_.pop_front();
    ++played_;
    return row;
}

void ScriptedUsbDevice::Complete(std::uint64_t number) {
    Running ended{};
    {
        const std::lock_guard guard(lock_);
        const auto found = std::ranges::find(running_, number, &Running::number);
        if (found == running_.end()) {
            return;
        }
        ended = std::move(*found);
        running_.erase(found);
    }
    Finish(ended);
}

void ScriptedUsbDevice::CompleteLater(std::uint64_t number, std::uint64_t delay) {
    auto& scheduler = Platform::ClockScheduler();
    const auto event = scheduler.CallAt(scheduler.Now() + delay, [this, number] { Complete(number); });
    const std::lock_guard guard(lock_);
    events_.push_back(event);
}

void ScriptedUsbDevice::Finish(const Running& completed) {
    Transfer& transfer = *completed.transfer;
    const Exchange& row = completed.row;
    if (transfer.IsIn()) {
        std::copy_n(row.received.begin(), std::min<std::size_t>(row.moved, row.received.size()),
                    transfer.data);
    }
    transfer.status = row.status;
    transfer.actualLength = std::min(row.moved, transfer.length);
    transfer.client->TransferCompleted(transfer);
}

void ScriptedBus::Unplug(const std::string& name) {
    const auto found = std::ranges::find(devices_, name, [](const auto& device) { return device.first; });
    found->second->Unplug();
    devices_.erase(found);
}

std::vector<std::string> ScriptedBus::List() {
    std::vector<std::string> names;
    for (const auto& device : devices_) {
        names.push_back(device.first);
    }
    return names;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedBus::Open(const std::string& name, ErrorCode& error) {
    const auto found = std::ranges::find(devices_, name, [](const auto& device) { return device.first; });
    error = openAnswer_ != Errors::Success ? openAnswer_
            : found == devices_.end()      ? Errors::FileNotFound
                                           : Errors::Success;
    return error == Errors::Success ? ScriptedUsbDevice::OpenHandle(found->second) : nullptr;
}

}  // namespace Varnholt::Tests
