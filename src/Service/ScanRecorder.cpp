#include "Service/ScanRecorder.h"

#include <algorithm>

namespace Varnholt::Service {

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
    report_.received += data.size();
    std::vector<std::uint8_t>& begun = report_.leftOver;
    if (!begun.empty()) {
        const auto missing = data.first(std::min(recordSize_ - begun.size(), data.size()));
        begun.insert(begun.end(), missing.begin(), missing.end());
        data = data.subspan(missing.size());
        if (begun.size() < recordSize_) {
            return;
        }
        PassOn(begun);
        begun.clear();
    }
    const auto whole = data.first(data.size() / recordSize_ * recordSize_);
    PassOn(whole);
    data = data.subspan(whole.size());
    begun.assign(data.begin(), data.end());
    progress_.Update(report_.received);
}

void ScanRecorder::PassOn(std::span<const std::uint8_t> records) {
    if (!records.empty()) {
        sink_(records, milliseconds_);
    }
}

}  // namespace Varnholt::Service
