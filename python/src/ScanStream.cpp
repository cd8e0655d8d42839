#include "ScanStream.h"

#include <algorithm>

#include "Interface/Readout.h"
#include "Platform/Threads.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Python {

using Service::Failure;
using Service::FailureKind;

namespace {

constexpr std::size_t MostWaiting = std::size_t{1} << 20;  // bytes
constexpr std::uint32_t LookForSignals = 50;               // milliseconds

}  // namespace

ScanStream::ScanStream(std::shared_ptr<Instrument> instrument, const Service::ScanSettings& settings)
    : instrument_(std::move(instrument)), settings_(settings) {
    thread_ = Platform::OwnedHandle(Platform::StartThread(
        [](void* argument) {
            static_cast<ScanStream*>(argument)->Run();
            return std::uint32_t{0};
        },
        this));
    if (!thread_) {
        throw Failure(FailureKind::Other, "no thread can be made for the scan");
    }
}

ScanStream::~ScanStream() {
    Close();
}

void ScanStream::Run() {
    std::exception_ptr failure;
    try {
        RunScan(*instrument_->opened_, settings_, *this, report_);
    } catch (const Failure& failed) {
        const bool isShort = report_.hasStoppedEarly;
        failure = std::make_exception_ptr(
            isShort
                ? failed.Advising("ask for fewer records, or for no number: then the scan is as long as the "
                                  "instrument makes it")
                : failed);
    } catch (...) {
        failure = std::current_exception();
    }
    const std::lock_guard held(section_);
    failure_ = failure;
    isFailed_ = failure != nullptr;
    hasEnded_ = true;
    Platform::SignalEvent(filled_.Get());
}

void ScanStream::TakeRecords(std::span<const std::uint8_t> records, std::uint64_t milliseconds) {
    for (;;) {
        {
            const std::lock_guard held(section_);
            if (mustEnd_) {
                throw Failure(FailureKind::Interrupted, "scan interrupted");
            }
            if (waiting_.size() < MostWaiting) {
                waiting_.insert(waiting_.end(), records.begin(), records.end());
                waitingSince_ = milliseconds;
                Platform::SignalEvent(filled_.Get());
                return;
            }
        }
        Platform::Wait(drained_.Get(), Platform::Infinite);
    }
}

bool ScanStream::IsRunning() {
    const std::lock_guard held(section_);
    return !hasEnded_;
}

/// False when a while has passed without any.
bool ScanStream::AwaitData() {
    const Away away;
    {
        const std::lock_guard held(section_);
        if (!waiting_.empty() || hasEnded_) {
            return true;
        }
    }
    Platform::Wait(filled_.Get(), LookForSignals);
    const std::lock_guard held(section_);
    return !waiting_.empty() || hasEnded_;
}

py::object ScanStream::Next(bool asBytes) {
    Host::Instance().CheckUsable();
    try {
        while (!AwaitData()) {
            CheckSignals();
        }
        CheckSignals();
    } catch (const py::error_already_set&) {
        Close();
        throw;
    }
    std::exception_ptr failure;
    taken_.clear();
    {
        const std::lock_guard held(section_);
        taken_.swap(waiting_);
        Platform::SignalEvent(drained_.Get());
        if (!taken_.empty()) {
            milliseconds_ = waitingSince_;
        } else {
            failure = std::exchange(failure_, nullptr);
        }
    }
    if (!taken_.empty()) {
        return ArrayOf(taken_, asBytes);
    }
    Join(false);
    if (failure) {
        std::rethrow_exception(failure);
    }
    return py::none();
}

py::object ScanStream::ArrayOf(const std::vector<std::uint8_t>& bytes, bool asBytes) const {
    const auto records = static_cast<py::ssize_t>(bytes.size() / settings_.recordSize);
    const auto size = static_cast<py::ssize_t>(settings_.recordSize);
    if (asBytes) {
        py::array_t<std::uint8_t> array({records, size});
        std::ranges::copy(bytes, array.mutable_data());
        return array;
    }
    py::array_t<std::int32_t> array({records, size / 2});
    std::int32_t* const values = array.mutable_data();
    const Away away;
    for (std::size_t i = 0; i < bytes.size() / 2; ++i) {
        values[i] = Interface::ReadingOf(Protocol::LoadBig16(&bytes[2 * i]));
    }
    return array;
}

void ScanStream::Close() {
    if (Host::Instance().IsForked()) {
        return;
    }
    {
        const std::lock_guard held(section_);
        mustEnd_ = !hasEnded_;
        waiting_.clear();
        Platform::SignalEvent(drained_.Get());
    }
    Join(mustEnd_);
}

/// Waits for the thread, and leaves the instrument to the next command.
void ScanStream::Join(bool mustInterrupt) {
    const AwayIfHere away;
    const std::lock_guard held(joining_);
    if (!thread_) {
        return;
    }
    if (mustInterrupt) {
        instrument_->interruption_.Request();
    }
    Platform::Wait(thread_.Get(), Platform::Infinite);
    thread_.Reset();
    instrument_->ScanEnded(mustInterrupt || isFailed_);
}

py::bytes ScanStream::LeftOver() const {
    return {reinterpret_cast<const char*>(report_.leftOver.data()), report_.leftOver.size()};
}

}  // namespace Varnholt::Python
