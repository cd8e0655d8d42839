#pragma once

#include <exception>
#include <functional>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/ScanReceiver.h"
#include "Service/ElapsedTime.h"

namespace Varnholt::Service {

/// Where the records of a scan go.
class RecordSink {
  public:
    virtual ~RecordSink() = default;
    /// Some whole records, one behind the other; `milliseconds` from the start they came, with one transfer.
    /// What is thrown ends the scan.
    virtual void TakeRecords(std::span<const std::uint8_t> records, std::uint64_t milliseconds) = 0;
};

/// Puts together the records of a scan from its transfers and passes them on as they arrive. Holds no more
/// than one transfer.
class ScanRecorder final : public DeviceDriver::Ostra::LowLevel::ScanReceiver {
  public:
    /// `recordSink` outlives the object. `arrived` is called with the bytes of the scan that came so far,
    /// each time when some more have been passed on.
    ScanRecorder(std::uint32_t recordSize, RecordSink& recordSink,
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

    const std::uint32_t recordSize_;
    RecordSink& sink_;
    const std::function<void(std::uint64_t bytes)> progress_;
    ElapsedTime time_;
    std::uint64_t milliseconds_ = 0;  ///< when the transfer came
    std::uint64_t received_ = 0;
    std::exception_ptr failure_;
    std::vector<std::uint8_t> begun_;  ///< a record that is not whole yet
};

}  // namespace Varnholt::Service
