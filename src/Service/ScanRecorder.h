#pragma once

#include <exception>
#include <functional>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/ScanReceiver.h"
#include "Service/ElapsedTime.h"
#include "Service/Observer.h"

namespace Varnholt::Service {

/// Takes some whole records, one behind the other; `milliseconds` from the start they came, with one
/// transfer. What it throws ends the scan.
using RecordSink = std::function<void(std::span<const std::uint8_t> records, std::uint64_t milliseconds)>;

/// How far a scan came.
struct ScanReport {
    std::uint64_t received = 0;          ///< bytes
    std::vector<std::uint8_t> leftOver;  ///< behind the last whole record
    bool hasStoppedEarly = false;        ///< the instrument has, before the total was there
};

/// Puts together the records of a scan from its transfers and passes them on as they arrive. Holds no more
/// than one transfer.
class ScanRecorder final : public DeviceDriver::Ostra::LowLevel::ScanReceiver {
  public:
    /// What is referred to outlives the object. The report says what has come, and the progress is told, each
    /// time when some more has been passed on.
    ScanRecorder(std::uint32_t recordSize, const RecordSink& recordSink, ScanReport& scanReport,
                 Progress& scanProgress)
        : recordSize_(recordSize), sink_(recordSink), report_(scanReport), progress_(scanProgress) {}

    void Receive(std::span<const std::uint8_t> data) override;

    /// What ended the scan on this side, such as a failure of the output: the library passes on its text
    /// alone. Null: nothing did.
    const std::exception_ptr& Failure() const { return failure_; }

  private:
    void Take(std::span<const std::uint8_t> data);

    const std::uint32_t recordSize_;
    const RecordSink& sink_;
    ScanReport& report_;  ///< its rest is a record that is not whole yet
    Progress& progress_;
    ElapsedTime time_;
    std::exception_ptr failure_;
};

}  // namespace Varnholt::Service
