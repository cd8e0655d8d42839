#pragma once

#include <array>
#include <cstdint>
#include <span>

#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {

/// How a readout is taken.
struct Exposure {
    std::uint64_t microseconds = 0;  ///< integration time
    std::uint32_t averages = 1;      ///< readouts that are averaged into one; less noise
};

/// The instrument's light sensor before a lamp: a readout looks like a spectrum, grows with the integration
/// time until it saturates, and is a little noisy. The same arguments give the same bytes on every machine.
class SensorModel final {
  public:
    SensorModel(std::uint64_t noiseSeed, double light, double gain);

    using Record = std::span<std::uint8_t, Protocol::ReadoutBytes>;
    /// Fills one readout. The first value is a covered pixel; the last two bytes hold `record`'s low 16 bits
    /// instead of a reading. Readings below zero, which noise makes in the dark, are sent as two's
    /// complement.
    void Read(const Exposure& exposure, std::uint64_t measurement, std::uint32_t record, Record bytes) const;

  private:
    const std::uint64_t seed_;
    /// Counts per second of each pixel.
    std::array<std::uint64_t, Protocol::ReadoutValues> sensitivity_{};
};

}  // namespace Varnholt::Simulator
