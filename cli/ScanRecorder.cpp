#include "ScanRecorder.h"

#include <algorithm>
#include <utility>

namespace Varnholt::Cli {

ScanRecorder::ScanRecorder(const ScanForm& scanForm, RecordOutput& recordOutput,
                           std::function<void(std::uint64_t bytes)> arrived)
    : form(scanForm),
      output(recordOutput),
      progress(std::move(arrived)),
      csv(scanForm.recordSize, scanForm.columns) {
    if (form.hasHead) {
        output.Append(csv.Head(), 0);
    }
}

void ScanRecorder::Receive(std::span<const std::uint8_t> data) {
    if (failure != nullptr) {  // what comes now has lost its place
        return;
    }
    try {
        Take(data);
    } catch (...) {
        failure = std::current_exception();
        throw;
    }
}

void ScanRecorder::Take(std::span<const std::uint8_t> data) {
    milliseconds = time.Milliseconds();
    received += data.size();
    if (!begun.empty()) {
        const auto missing = data.first(std::min(form.recordSize - begun.size(), data.size()));
        begun.insert(begun.end(), missing.begin(), missing.end());
        data = data.subspan(missing.size());
        if (begun.size() < form.recordSize) {
            return;
        }
        PassOn(begun);
        begun.clear();
    }
    const auto whole = data.first(data.size() / form.recordSize * form.recordSize);
    PassOn(whole);
    data = data.subspan(whole.size());
    begun.assign(data.begin(), data.end());
    progress(received);
}

void ScanRecorder::PassOn(std::span<const std::uint8_t> records) {
    const std::uint64_t count = records.size() / form.recordSize;
    if (count == 0) {
        return;
    }
    if (form.isRaw) {
        output.Append({reinterpret_cast<const char*>(records.data()), records.size()}, count);
    } else {
        output.Append(csv.Lines(records, output.Records() + 1, milliseconds), count,
                      RecordOutput::Form::Lines);
    }
}

}  // namespace Varnholt::Cli
