#pragma once

#include <cstdint>
#include <vector>

#include "Protocol/Instrument.h"
#include "SensorModel.h"

namespace Varnholt::Simulator {

/// The bytes that the instrument has ready for its bulk IN endpoint.
class AnswerStream final {
  public:
    explicit AnswerStream(const SensorModel& lightSensor) : sensor_(lightSensor) {}

    /// Readouts one after the other, `bytes` in all; ends with a transfer that does not become full.
    void StartMeasurement(const Exposure& exposure, std::uint64_t measurement, std::uint64_t bytes);
    /// Memory content of a length that the host has named; nothing follows it.
    void StartMemory(std::vector<std::uint8_t> content);
    void Stop();

    /// Something is there, if only the end of a measurement.
    bool Active() const { return position_ < total_ || endDue_; }
    std::uint64_t Remaining() const { return total_ - position_; }

    /// Moves at most `length` bytes, not 0, on to `buffer`, as one transfer.
    std::uint32_t Take(std::uint8_t* buffer, std::uint32_t length);

  private:
    /// A measurement repeats after this many records: making them anew would cost more than the transfers
    /// that are measured against it. A prime, so that no two transfers of equal size are alike.
    static constexpr std::uint32_t RecordsBeforeRepeat = 251;
    static constexpr std::size_t BytesBeforeRepeat =
        std::size_t{RecordsBeforeRepeat} * Protocol::ReadoutBytes;

    void MakeRecords(std::size_t bytes);

    const SensorModel& sensor_;
    Exposure exposure_;
    std::uint64_t measurement_ = 0;
    std::vector<std::uint8_t> content_;  // memory, or the records made so far
    bool measuring_ = false;
    std::uint64_t total_ = 0;
    std::uint64_t position_ = 0;
    bool endDue_ = false;
};

}  // namespace Varnholt::Simulator
