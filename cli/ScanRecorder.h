#pragma once

#include <exception>
#include <functional>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/ScanReceiver.h"
#include "ElapsedTime.h"
#include "Output/RecordCsv.h"
#include "Output/RecordOutput.h"

namespace Varnholt::Cli {

/// What a scan's records look like where they go.
struct ScanForm {
    std::uint32_t recordSize = 0;  ///< bytes
    bool isRaw = false;            ///< as they came; otherwise as CSV, of an even record size
    bool hasHead = false;          ///< of CSV: begins with the names of the columns
    CsvColumns columns;
};

/// Puts together the records of a scan from its transfers and passes them on as they arrive. Holds no more
/// than one transfer.
class ScanRecorder final : public DeviceDriver::Ostra::LowLevel::ScanReceiver {
  public:
    /// `recordOutput` outlives the object. `arrived` is called with the bytes of the scan that came so far,
    /// each time when some more have been passed on.
    ScanRecorder(const ScanForm& scanForm, RecordOutput& recordOutput,
                 std::function<void(std::uint64_t bytes)> arrived);

    void Receive(std::span<const std::uint8_t> data) override;

    /// What ended the scan on this side, such as a failure of the output: the library passes on its text
    /// alone. Null: nothing did.
    const std::exception_ptr& Failure() const { return failure_; }
    std::uint64_t Received() const { return received_; }
    /// Bytes behind the last whole record.
    std::span<const std::uint8_t> LeftOver() const { return begun_; }

  private:
    void Take(std::span<const std::uint8_t> data);
    void PassOn(std::span<const std::uint8_t> records);

    const ScanForm form_;
    RecordOutput& output_;
    const std::function<void(std::uint64_t bytes)> progress_;
    RecordCsv csv_;
    ElapsedTime time_;
    std::uint64_t milliseconds_ = 0;  ///< when the transfer came
    std::uint64_t received_ = 0;
    std::exception_ptr failure_;
    std::vector<std::uint8_t> begun_;  ///< a record that is not whole yet
};

}  // namespace Varnholt::Cli
