#include "Support/ScriptedUsbDevice.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "Platform/EventScheduler.h"

namespace Varnholt::Tests {

using Platform::ErrorCode;
using Platform::Usb::Transfer;
using Platform::Usb::TransferStatus;
namespace Errors = Platform::Errors;

ScriptedUsbDevice::ScriptedUsbDevice(std::vector<Exchange> rows)
    : script_(std::make_move_iterator(rows.begin()), std::make_move_iterator(rows.end())) {}

ScriptedUsbDevice::~ScriptedUsbDevice() {
    for (const std::uint64_t event : events_) {
        Platform::ClockScheduler().Forget(event);
    }
    Unplug();
    if (!script_.empty() && !failed_) {
        ADD_FAILURE() << script_.size() << " rows of the script were not played; the next, row " << played_
                      << ":\n  expected: " << script_.front().Describe();
    }
}

void ScriptedUsbDevice::Expect(std::vector<Exchange> rows) {
    const std::lock_guard guard(lock_);
    script_.insert(script_.end(), std::make_move_iterator(rows.begin()), std::make_move_iterator(rows.end()));
}

void ScriptedUsbDevice::LeaveToTest(std::uint8_t endpoint) {
    const std::lock_guard guard(lock_);
    leftToTest_.insert(endpoint);
}

void ScriptedUsbDevice::Send(std::uint8_t endpoint, Bytes data) {
    {
        const std::lock_guard guard(lock_);
        const auto oldest = std::ranges::find_if(running_, [endpoint](const Running& candidate) {
            return candidate.transfer->endpoint == endpoint && !candidate.ready;
        });
        if (oldest == running_.end()) {
            unsent_.emplace_back(endpoint, std::move(data));
            return;
        }
        oldest->row = BulkIn(oldest->transfer->length, std::move(data), endpoint);
        oldest->ready = true;
    }
    CompleteReady(endpoint);
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

std::vector<Platform::Usb::EndpointInfo> ScriptedUsbDevice::Endpoints(Platform::ErrorCode& error) {
    error = Get(endpointsAnswer_);
    if (error != Platform::Errors::Success) {
        return {};
    }
    return {{Protocol::BulkOutEndpoint, 2, 512},
            {Protocol::BulkInEndpoint, 2, 512},
            {Protocol::InterruptInEndpoint, 3, 8}};
}

ErrorCode ScriptedUsbDevice::Claim() {
    const std::lock_guard guard(lock_);
    const ErrorCode answer = gone_ ? Errors::DeviceNotConnected : claimAnswer_;
    if (answer == Errors::Success) {
        claimed_ = true;
        ++timesClaimed_;
    }
    return answer;
}

void ScriptedUsbDevice::Release() {
    const std::lock_guard guard(lock_);
    claimed_ = false;
}

ErrorCode ScriptedUsbDevice::Submit(Transfer& transfer) {
    const std::uint8_t endpoint = transfer.endpoint;
    std::uint64_t number = 0;
    std::uint64_t delay = 0;
    {
        const std::lock_guard guard(lock_);
        if (gone_) {
            return Errors::DeviceNotConnected;
        }
        number = ++lastNumber_;
        Running submitted{number, &transfer, {}, false, false};
        if (leftToTest_.contains(endpoint)) {
            const auto waiting =
                std::ranges::find(unsent_, endpoint, [](const auto& sent) { return sent.first; });
            if (waiting == unsent_.end()) {
                delay = Exchange::Never;
            } else {
                submitted.row = BulkIn(transfer.length, std::move(waiting->second), endpoint);
                unsent_.erase(waiting);
            }
        } else if (script_.empty() || !Matches(script_.front(), transfer)) {
            Mismatch(Describe(transfer));
            submitted.row.status = TransferStatus::Stalled;
        } else {
            submitted.row = std::move(script_.front());
            script_.pop_front();
            ++played_;
            if (submitted.row.refusal != Errors::Success) {
                return submitted.row.refusal;
            }
            delay = submitted.row.delay;
        }
        submitted.ready = delay == 0;
        running_.push_back(std::move(submitted));
    }
    if (delay == 0) {
        CompleteReady(endpoint);
    } else if (delay != Exchange::Never) {
        CompleteLater(number, delay);
    }
    return Errors::Success;
}

void ScriptedUsbDevice::Cancel(Transfer& transfer) {
    const std::uint8_t endpoint = transfer.endpoint;
    Running ended{};
    bool later = false;
    {
        const std::lock_guard guard(lock_);
        const auto found = std::ranges::find_if(running_, [&transfer](const Running& candidate) {
            return candidate.transfer == &transfer && !candidate.cancelled;
        });
        if (found == running_.end()) {
            return;
        }
        found->row = found->row.Ends(TransferStatus::Cancelled, found->row.movedWhenCancelled);
        found->cancelled = true;
        ended = *found;
        later = cancelLater_;
        if (!later) {
            running_.erase(found);
        }
    }
    if (later) {
        CompleteLater(ended.number, 0);
    } else {
        Finish(ended);
        CompleteReady(endpoint);
    }
}

ErrorCode ScriptedUsbDevice::ClearHalt(std::uint8_t endpoint) {
    const std::lock_guard guard(lock_);
    if (gone_) {
        return Errors::DeviceNotConnected;
    }
    if (script_.empty() || script_.front().kind != Exchange::Kind::ClearHalt ||
        script_.front().endpoint != endpoint) {
        Mismatch(HaltCleared(endpoint).Describe());
        return Errors::Success;
    }
    const ErrorCode answer = script_.front().refusal;
    script_.pop_front();
    ++played_;
    if (answer == Errors::Success) {
        halted_.erase(endpoint);
    }
    return answer;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedUsbDevice::OpenHandle(
    const std::shared_ptr<ScriptedUsbDevice>& device) {
    const std::lock_guard guard(device->lock_);
    ++device->handles_;
    ++device->timesOpened_;
    return {device.get(), [device](Platform::Usb::UsbDevice*) {
                const std::lock_guard closing(device->lock_);
                if (--device->handles_ == 0) {
                    device->claimed_ = false;
                }
                EXPECT_TRUE(device->handles_ > 0 || device->running_.empty())
                    << "the device was closed while transfers ran";
            }};
}

bool ScriptedUsbDevice::Matches(const Exchange& row, const Transfer& transfer) const {
    return row.kind == Exchange::Kind::Transfer && row.endpoint == transfer.endpoint &&
           !halted_.contains(transfer.endpoint) && row.length == transfer.length &&
           (row.endpoint != 0 || row.setup == transfer.setup) &&
           (row.IsIn() || std::equal(row.sent.begin(), row.sent.end(), transfer.data));
}

void ScriptedUsbDevice::Mismatch(const std::string& actual) {
    // One difference makes all that follow differ.
    if (!failed_) {
        failed_ = true;
        ADD_FAILURE() << "row " << played_ << " of the script differs\n  expected: "
                      << (script_.empty() ? "nothing more" : script_.front().Describe())
                      << "\n  actual:   " << actual << (halted_.empty() ? "" : " (an endpoint is halted)");
    }
}

void ScriptedUsbDevice::CompleteReady(std::uint8_t endpoint) {
    for (;;) {
        Running ended{};
        {
            const std::lock_guard guard(lock_);
            const auto oldest = std::ranges::find_if(running_, [endpoint](const Running& candidate) {
                return candidate.transfer->endpoint == endpoint && !candidate.cancelled;
            });
            if (oldest == running_.end() || !oldest->ready) {
                return;
            }
            ended = std::move(*oldest);
            running_.erase(oldest);
            if (ended.row.status == TransferStatus::Stalled && endpoint != 0 && !failed_) {
                halted_.insert(endpoint);
            }
        }
        Finish(ended);
    }
}

void ScriptedUsbDevice::CompleteLater(std::uint64_t number, std::uint64_t delay) {
    auto& scheduler = Platform::ClockScheduler();
    const auto event = scheduler.CallAt(scheduler.Now() + delay, [this, number] {
        Running ended{};
        std::uint8_t endpoint = 0;
        {
            const std::lock_guard guard(lock_);
            const auto found = std::ranges::find(running_, number, &Running::number);
            if (found == running_.end()) {
                return;
            }
            endpoint = found->transfer->endpoint;
            found->ready = true;
            if (found->cancelled) {
                ended = std::move(*found);
                running_.erase(found);
            }
        }
        if (ended.transfer != nullptr) {
            Finish(ended);
        }
        CompleteReady(endpoint);
    });
    const std::lock_guard guard(lock_);
    events_.push_back(event);
}

void ScriptedUsbDevice::Finish(const Running& completed) {
    Transfer& transfer = *completed.transfer;
    const Exchange& row = completed.row;
    if (transfer.IsIn()) {
        const std::size_t copied = std::min<std::size_t>({row.moved, row.received.size(), transfer.length});
        std::copy_n(row.received.begin(), copied, transfer.data);
    }
    transfer.status = row.status;
    transfer.actualLength = std::min(row.moved, transfer.length);
    transfer.client->TransferCompleted(transfer);
}

void ScriptedBus::Plug(const std::string& name, std::shared_ptr<ScriptedUsbDevice> device) {
    const std::lock_guard guard(lock_);
    devices_.emplace_back(name, std::move(device));
}

ScriptedBus::Devices::iterator ScriptedBus::FindDevice(const std::string& name) {
    return std::ranges::find(devices_, name, [](const auto& device) { return device.first; });
}

void ScriptedBus::Unplug(const std::string& name) {
    std::shared_ptr<ScriptedUsbDevice> unplugged;
    {
        const std::lock_guard guard(lock_);
        const auto found = FindDevice(name);
        if (found == devices_.end()) {
            return;
        }
        unplugged = std::move(found->second);
        devices_.erase(found);
    }
    unplugged->Unplug();
}

void ScriptedBus::AnswerOpen(ErrorCode code) {
    const std::lock_guard guard(lock_);
    openAnswer_ = code;
}

std::vector<std::string> ScriptedBus::List() {
    const std::lock_guard guard(lock_);
    std::vector<std::string> names;
    for (const auto& device : devices_) {
        names.push_back(device.first);
    }
    return names;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedBus::Open(const std::string& name, ErrorCode& error) {
    const std::lock_guard guard(lock_);
    error = openAnswer_;
    if (error != Errors::Success) {
        return nullptr;
    }
    const auto found = FindDevice(name);
    if (found == devices_.end()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    return ScriptedUsbDevice::OpenHandle(found->second);
}

}  // namespace Varnholt::Tests
