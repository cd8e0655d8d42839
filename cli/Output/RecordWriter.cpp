#include "Output/RecordWriter.h"

namespace Varnholt::Cli {

RecordWriter::RecordWriter(const ScanForm& scanForm, RecordOutput& recordOutput)
    : form_(scanForm), output_(recordOutput), csv_(scanForm.recordSize, scanForm.columns) {
    if (form_.hasHead) {
        output_.Append(csv_.Head(), 0);
    }
}

void RecordWriter::TakeRecords(std::span<const std::uint8_t> records, std::uint64_t milliseconds) {
    const std::uint64_t count = records.size() / form_.recordSize;
    if (form_.isRaw) {
        output_.Append({reinterpret_cast<const char*>(records.data()), records.size()}, count);
    } else {
        output_.Append(csv_.Lines(records, output_.Records() + 1, milliseconds), count,
                       RecordOutput::Form::Lines);
    }
}

}  // namespace Varnholt::Cli
