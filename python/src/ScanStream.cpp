#include "ScanStream.h"

#include <algorithm>
#include <array>

#include "Interface/Readout.h"
#include "Platform/Threads.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Python {

using Service::Failure;
using Service::FailureKind;

namespace {

constexpr std::size_t BlockBytes = std::size_t{256} << 10;  // of records
constexpr std::size_t MostWaiting = 4;                      // blocks
constexpr std::uint32_t Gather = 1;           // milliseconds until a block is handed out with what it has
constexpr std::uint32_t LookForSignals = 50;  // milliseconds

}  // namespace

ScanStream::ScanStream(std::shared_ptr<Instrument> instrument, const Service::ScanSettings& settings,
                       bool asBytes)
    : instrument_(std::move(instrument)), settings_(settings), asBytes_(asBytes) {
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
        RunScan(
            *instrument_->opened_, settings_,
            [this](auto records, std::uint64_t milliseconds) { TakeRecords(records, milliseconds); },
            report_);
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
    while (!records.empty()) {
        std::size_t taken = 0;
        {
            const std::lock_guard held(section_);
            if (mustEnd_) {
                throw Failure(FailureKind::Interrupted, "scan interrupted");
            }
            const bool wasEnough = HasEnough();
            const bool wasEmpty = waiting_.empty();
            taken = Append(records);
            if (taken > 0) {
                waiting_.back().milliseconds = milliseconds;
            }
            if (wasEmpty || HasEnough() != wasEnough) {
                Platform::SignalEvent(filled_.Get());
            }
        }
        if (taken == 0) {
            Platform::Wait(drained_.Get(), Platform::Infinite);
        }
        records = records.subspan(taken);
    }
}

/// Bytes for which there was room. Values are made here, on the scan's thread: the other one has its own work
/// with those it has taken.
std::size_t ScanStream::Append(std::span<const std::uint8_t> records) {
    const std::size_t capacity = BlockBytes / settings_.recordSize * settings_.recordSize;
    if (waiting_.empty() || waiting_.back().bytes == capacity) {
        if (waiting_.size() == MostWaiting) {
            return 0;
        }
        waiting_.push_back({pool_->Take(asBytes_ ? BlockBytes : 2 * BlockBytes)});
    }
    Block& block = waiting_.back();
    const std::size_t count = std::min(records.size(), capacity - block.bytes);
    if (asBytes_) {
        std::copy_n(records.data(), count, reinterpret_cast<std::uint8_t*>(block.memory.get()) + block.bytes);
    } else {
        auto* const values = reinterpret_cast<std::int32_t*>(block.memory.get()) + block.bytes / 2;
        for (std::size_t i = 0; i < count / 2; ++i) {
            values[i] = Interface::ReadingOf(Protocol::LoadBig16(&records[2 * i]));
        }
    }
    block.bytes += count;
    return count;
}

bool ScanStream::IsRunning() {
    const std::lock_guard held(section_);
    return !hasEnded_;
}

/// The first block is mostly full, or there is no more to come.
bool ScanStream::HasEnough() const {
    return hasEnded_ || (!waiting_.empty() && waiting_.front().bytes >= BlockBytes / 2);
}

/// False when a while has passed without any.
bool ScanStream::AwaitData() {
    const Away away;
    for (const std::uint32_t patience : {LookForSignals, Gather}) {
        {
            const std::lock_guard held(section_);
            if (HasEnough()) {
                return true;
            }
            if (patience == LookForSignals && !waiting_.empty()) {
                continue;
            }
            Platform::ResetEvent(filled_.Get());
        }
        Platform::Wait(filled_.Get(), patience);
    }
    const std::lock_guard held(section_);
    return hasEnded_ || !waiting_.empty();
}

py::object ScanStream::Next() {
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
    Block block;
    {
        const std::lock_guard held(section_);
        if (!waiting_.empty()) {
            block = std::move(waiting_.front());
            waiting_.pop_front();
            milliseconds_ = block.milliseconds;
            Platform::SignalEvent(drained_.Get());
        } else {
            failure = std::exchange(failure_, nullptr);
        }
    }
    if (block.bytes > 0) {
        return asBytes_ ? ArrayOf<std::uint8_t>(std::move(block)) : ArrayOf<std::int32_t>(std::move(block));
    }
    Join(false);
    if (failure) {
        std::rethrow_exception(failure);
    }
    return py::none();
}

/// In the memory of the block where that is mostly full, so that no array keeps more than it uses.
template <class Element>
py::object ScanStream::ArrayOf(Block block) const {
    const auto* const elements = reinterpret_cast<const Element*>(block.memory.get());
    const std::array shape{static_cast<py::ssize_t>(block.bytes / settings_.recordSize),
                           static_cast<py::ssize_t>(settings_.recordSize) / (asBytes_ ? 1 : 2)};
    if (block.bytes >= BlockBytes / 2) {
        return py::array_t<Element>(shape, elements, BlockPool::Owner(pool_, std::move(block.memory)));
    }
    py::array_t<Element> array(shape);
    std::copy_n(elements, array.size(), array.mutable_data());
    pool_->GiveBack(std::move(block.memory));
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
