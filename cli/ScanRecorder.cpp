#include "ScanRecorder.h"

#include <algorithm>
#include <utility>

namespace Varnholt::Cli {

ScanRecorder::ScanRecorder(const ScanForm& scanForm, RecordOutput& recordOutput,
                           std::function<void(std::uint64_t bytes)> arrived)
    : form_(scanForm),
      output_(recordOutput),
      progress_(std::move(arrived)),
      csv_(scanForm.recordSize, scanForm.columns) {
    if (form_.hasHead) {
        output_.Append(csv_.Head(), 0);
    }
}

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
        const auto missing = data.first(std::min(form_.recordSize - begun_.size(), data.size()));
        begun_.insert(begun_.end(), missing.begin(), missing.end());
        data = data.subspan(missing.size());
        if (begun_.size() < form_.recordSize) {
            return;
        }
        PassOn(begun_);
        begun_.clear();
    }
    const auto whole = data.first(data.size() / form_.recordSize * form_.recordSize);
    PassOn(whole);
    data = data.subspan(whole.size());
    begun_.assign(data.begin(), data.end());
    progress_(received_);
}

void ScanRecorder::PassOn(std::span<const std::uint8_t> records) {
    const std::uint64_t count = records.size() / form_.recordSize;
    if (count == 0) {
        return;
    }
    if (form_.isRaw) {
        output_.Append({reinterpret_cast<const char*>(records.data()), records.size()}, count);
    } else {
        output_.Append(csv_.Lines(records, output_.Records() + 1, milliseconds_), count,
                       RecordOutput::Form::Lines);
    }
}

}  // namespace Varnholt::Cli
