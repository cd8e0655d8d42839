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
    const std::uint64_t milliseconds = time_.Milliseconds();
    report_.received += data.size();
    std::vector<std::uint8_t>& begun = report_.leftOver;
    if (!begun.empty()) {
        const auto missing = data.first(std::min(recordSize_ - begun.size(), data.size()));
        begun.insert(begun.end(), missing.begin(), missing.end());
        data = data.subspan(missing.size());
        if (begun.size() < recordSize_) {
            return;
        }
        sink_(begun, milliseconds);
        begun.clear();
    }
    const auto whole = data.first(data.size() / recordSize_ * recordSize_);
    if (!whole.empty()) {
        sink_(whole, milliseconds);
    }
    data = data.subspan(whole.size());
    begun.assign(data.begin(), data.end());
    progress_.Update(report_.received);
}

}  // namespace Varnholt::Service
