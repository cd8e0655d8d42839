#include "Service/ScanRecorder.h"

#include <algorithm>
#include <utility>

namespace Varnholt::Service {

ScanRecorder::ScanRecorder(std::uint32_t recordSize, RecordSink& recordSink,
                           std::function<void(std::uint64_t bytes)> arrived)
    : recordSize_(recordSize), sink_(recordSink), progress_(std::move(arrived)) {}

void ScanRecorder::Receive(std::span<const std::uint8_t> data) {
    if (failure_ != nullptr) {  // what comes now has lost its place
        return;
    }
    try {
        Take(data);
    } catch (...) {
        failure_ = std::current_exception();
        throw;
    }
}

void ScanRecorder::Take(std::span<const std::uint8_t> data) {
    milliseconds_ = time_.Milliseconds();
    received_ += data.size();
    if (!begun_.empty()) {
        const auto missing = data.first(std::min(recordSize_ - begun_.size(), data.size()));
        begun_.insert(begun_.end(), missing.begin(), missing.end());
        data = data.subspan(missing.size());
        if (begun_.size() < recordSize_) {
            return;
        }
        PassOn(begun_);
        begun_.clear();
    }
    const auto whole = data.first(data.size() / recordSize_ * recordSize_);
    PassOn(whole);
    data = data.subspan(whole.size());
    begun_.assign(data.begin(), data.end());
    progress_(received_);
}

void ScanRecorder::PassOn(std::span<const std::uint8_t> records) {
    if (!records.empty()) {
        sink_.TakeRecords(records, milliseconds_);
    }
}

}  // namespace Varnholt::Service
