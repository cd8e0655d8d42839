#pragma once

#include "Output/RecordCsv.h"
#include "Output/RecordOutput.h"
#include "Service/ScanRecorder.h"

namespace Varnholt::Cli {

/// What a scan's records look like where they go.
struct ScanForm {
    std::uint32_t recordSize = 0;  ///< bytes
    bool isRaw = false;            ///< as they came; otherwise as CSV, of an even record size
    bool hasHead = false;          ///< of CSV: begins with the names of the columns
    CsvColumns columns;
};

/// Puts the records of a scan into their form, and into an output.
class RecordWriter final : public Service::RecordSink {
  public:
    /// `recordOutput` outlives the object.
    RecordWriter(const ScanForm& scanForm, RecordOutput& recordOutput);

    void TakeRecords(std::span<const std::uint8_t> records, std::uint64_t milliseconds) override;

  private:
    const ScanForm form_;
    RecordOutput& output_;
    RecordCsv csv_;
};

}  // namespace Varnholt::Cli
