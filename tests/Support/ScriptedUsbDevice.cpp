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
    : script(std::make_move_iterator(rows.begin()), std::make_move_iterator(rows.end())) {}

ScriptedUsbDevice::~ScriptedUsbDevice() {
    for (const std::uint64_t event : events) {
        Platform::ClockScheduler().Forget(event);
    }
    Unplug();
    if (!script.empty() && !failed) {
        ADD_FAILURE() << script.size() << " rows of the script were not played; the next, row " << played
                      << ":\n  expected: " << script.front().Describe();
    }
}

void ScriptedUsbDevice::Expect(std::vector<Exchange> rows) {
    const std::lock_guard guard(lock);
    script.insert(script.end(), std::make_move_iterator(rows.begin()), std::make_move_iterator(rows.end()));
}

void ScriptedUsbDevice::LeaveToTest(std::uint8_t endpoint) {
    const std::lock_guard guard(lock);
    leftToTest.insert(endpoint);
}

void ScriptedUsbDevice::Send(std::uint8_t endpoint, Bytes data) {
    {
        const std::lock_guard guard(lock);
        const auto oldest = std::ranges::find_if(running, [endpoint](const Running& candidate) {
            return candidate.transfer->endpoint == endpoint && !candidate.ready;
        });
        if (oldest == running.end()) {
            unsent.emplace_back(endpoint, std::move(data));
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
        const std::lock_guard guard(lock);
        gone = true;
        ended.swap(running);
    }
    for (Running& transfer : ended) {
        transfer.row = transfer.row.Ends(TransferStatus::DeviceGone);
        Finish(transfer);
    }
}

std::size_t ScriptedUsbDevice::Pending(std::uint8_t endpoint) const {
    const std::lock_guard guard(lock);
    return static_cast<std::size_t>(std::ranges::count(
        running, endpoint, [](const Running& candidate) { return candidate.transfer->endpoint; }));
}

std::vector<Platform::Usb::EndpointInfo> ScriptedUsbDevice::Endpoints(Platform::ErrorCode& error) {
    error = Get(endpointsAnswer);
    if (error != Platform::Errors::Success) {
        return {};
    }
    return {{Protocol::BulkOutEndpoint, 2, 512},
            {Protocol::BulkInEndpoint, 2, 512},
            {Protocol::InterruptInEndpoint, 3, 8}};
}

ErrorCode ScriptedUsbDevice::Claim() {
    const std::lock_guard guard(lock);
    const ErrorCode answer = gone ? Errors::DeviceNotConnected : claimAnswer;
    if (answer == Errors::Success) {
        claimed = true;
        ++timesClaimed;
    }
    return answer;
}

void ScriptedUsbDevice::Release() {
    const std::lock_guard guard(lock);
    claimed = false;
}

ErrorCode ScriptedUsbDevice::Submit(Transfer& transfer) {
    const std::uint8_t endpoint = transfer.endpoint;
    std::uint64_t number = 0;
    std::uint64_t delay = 0;
    {
        const std::lock_guard guard(lock);
        if (gone) {
            return Errors::DeviceNotConnected;
        }
        number = ++lastNumber;
        Running submitted{number, &transfer, {}, false, false};
        if (leftToTest.contains(endpoint)) {
            const auto waiting =
                std::ranges::find(unsent, endpoint, [](const auto& sent) { return sent.first; });
            if (waiting == unsent.end()) {
                delay = Exchange::Never;
            } else {
                submitted.row = BulkIn(transfer.length, std::move(waiting->second), endpoint);
                unsent.erase(waiting);
            }
        } else if (script.empty() || !Matches(script.front(), transfer)) {
            Mismatch(Describe(transfer));
            submitted.row.status = TransferStatus::Stalled;
        } else {
            submitted.row = std::move(script.front());
            script.pop_front();
            ++played;
            if (submitted.row.refusal != Errors::Success) {
                return submitted.row.refusal;
            }
            delay = submitted.row.delay;
        }
        submitted.ready = delay == 0;
        running.push_back(std::move(submitted));
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
        const std::lock_guard guard(lock);
        const auto found = std::ranges::find_if(running, [&transfer](const Running& candidate) {
            return candidate.transfer == &transfer && !candidate.cancelled;
        });
        if (found == running.end()) {
            return;
        }
        found->row = found->row.Ends(TransferStatus::Cancelled, found->row.movedWhenCancelled);
        found->cancelled = true;
        ended = *found;
        later = cancelLater;
        if (!later) {
            running.erase(found);
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
    const std::lock_guard guard(lock);
    if (gone) {
        return Errors::DeviceNotConnected;
    }
    if (script.empty() || script.front().kind != Exchange::Kind::ClearHalt ||
        script.front().endpoint != endpoint) {
        Mismatch(HaltCleared(endpoint).Describe());
        return Errors::Success;
    }
    const ErrorCode answer = script.front().refusal;
    script.pop_front();
    ++played;
    if (answer == Errors::Success) {
        halted.erase(endpoint);
    }
    return answer;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedUsbDevice::OpenHandle(
    const std::shared_ptr<ScriptedUsbDevice>& device) {
    const std::lock_guard guard(device->lock);
    ++device->handles;
    ++device->timesOpened;
    return {device.get(), [device](Platform::Usb::UsbDevice*) {
                const std::lock_guard closing(device->lock);
                if (--device->handles == 0) {
                    device->claimed = false;
                }
                EXPECT_TRUE(device->handles > 0 || device->running.empty())
                    << "the device was closed while transfers ran";
            }};
}

bool ScriptedUsbDevice::Matches(const Exchange& row, const Transfer& transfer) const {
    return row.kind == Exchange::Kind::Transfer && row.endpoint == transfer.endpoint &&
           !halted.contains(transfer.endpoint) && row.length == transfer.length &&
           (row.endpoint != 0 || row.setup == transfer.setup) &&
           (row.IsIn() || std::equal(row.sent.begin(), row.sent.end(), transfer.data));
}

void ScriptedUsbDevice::Mismatch(const std::string& actual) {
    // One difference makes all that follow differ.
    if (!failed) {
        failed = true;
        ADD_FAILURE() << "row " << played << " of the script differs\n  expected: "
                      << (script.empty() ? "nothing more" : script.front().Describe())
                      << "\n  actual:   " << actual << (halted.empty() ? "" : " (an endpoint is halted)");
    }
}

void ScriptedUsbDevice::CompleteReady(std::uint8_t endpoint) {
    for (;;) {
        Running ended{};
        {
            const std::lock_guard guard(lock);
            const auto oldest = std::ranges::find_if(running, [endpoint](const Running& candidate) {
                return candidate.transfer->endpoint == endpoint && !candidate.cancelled;
            });
            if (oldest == running.end() || !oldest->ready) {
                return;
            }
            ended = std::move(*oldest);
            running.erase(oldest);
            if (ended.row.status == TransferStatus::Stalled && endpoint != 0 && !failed) {
                halted.insert(endpoint);
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
            const std::lock_guard guard(lock);
            const auto found = std::ranges::find(running, number, &Running::number);
            if (found == running.end()) {
                return;
            }
            endpoint = found->transfer->endpoint;
            found->ready = true;
            if (found->cancelled) {
                ended = std::move(*found);
                running.erase(found);
            }
        }
        if (ended.transfer != nullptr) {
            Finish(ended);
        }
        CompleteReady(endpoint);
    });
    const std::lock_guard guard(lock);
    events.push_back(event);
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
    const std::lock_guard guard(lock);
    devices.emplace_back(name, std::move(device));
}

ScriptedBus::Devices::iterator ScriptedBus::FindDevice(const std::string& name) {
    return std::ranges::find(devices, name, [](const auto& device) { return device.first; });
}

void ScriptedBus::Unplug(const std::string& name) {
    std::shared_ptr<ScriptedUsbDevice> unplugged;
    {
        const std::lock_guard guard(lock);
        const auto found = FindDevice(name);
        if (found == devices.end()) {
            return;
        }
        unplugged = std::move(found->second);
        devices.erase(found);
    }
    unplugged->Unplug();
}

void ScriptedBus::AnswerOpen(ErrorCode code) {
    const std::lock_guard guard(lock);
    openAnswer = code;
}

std::vector<std::string> ScriptedBus::List() {
    const std::lock_guard guard(lock);
    std::vector<std::string> names;
    for (const auto& device : devices) {
        names.push_back(device.first);
    }
    return names;
}

std::shared_ptr<Platform::Usb::UsbDevice> ScriptedBus::Open(const std::string& name, ErrorCode& error) {
    const std::lock_guard guard(lock);
    error = openAnswer;
    if (error != Errors::Success) {
        return nullptr;
    }
    const auto found = FindDevice(name);
    if (found == devices.end()) {
        error = Errors::FileNotFound;
        return nullptr;
    }
    return ScriptedUsbDevice::OpenHandle(found->second);
}

}  // namespace Varnholt::Tests
