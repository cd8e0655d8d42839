#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {

/// One measurement mode: how long the unit of the integration time is, and what it can represent.
struct MeasureMode {
    std::uint8_t coarseFactor;      ///< time units in one unit of the second measurement time
    std::uint8_t tickMicroseconds;  ///< the time unit; the longest integration time is 65535 of them
    std::uint8_t flags;             ///< bit 0: perfect mode
};

inline constexpr std::uint16_t OldFirmware = 300;
/// From this version on the instrument has measurement modes to choose from.
inline constexpr std::uint16_t NewFirmware = 301;

/// The values that `GetMisc` answers, beside the firmware version. Each byte differs, so that one taken for
/// another shows.
struct MiscValues {
    std::uint8_t m1 = 0x21;
    std::uint8_t m3 = 0x43;
    std::uint16_t m4 = 0x0506;
    std::uint16_t m5 = 0x0708;
};

/// What a simulated instrument is like.
struct InstrumentSettings {
    std::string serial = "SIM0001";
    std::array<std::uint8_t, 8> chipId{0x5A, 0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD};
    std::uint16_t firmware = NewFirmware;
    MiscValues misc{};
    std::uint8_t fifthParameter = 0x55;  ///< p5, which can only be read

    /// Modes 1, 2, ... of the new firmware. The old one has the first only.
    std::vector<MeasureMode> modes{{130, 68, 1}, {130, 34, 0}, {100, 10, 0}};

    /// The EEPROM's content, 8192 bytes; empty: that of a fresh instrument.
    std::vector<std::uint8_t> eeprom{};

    std::uint64_t seed = 1;  ///< of the sensor's noise
    double light = 1.0;      ///< brightness of the lamp; 0 is dark
    double gain = 1.0;       ///< of the sensor's amplifier

    /// Bytes that a measurement streams in all. The instrument cannot know whether the host wants one readout
    /// or a scan, so it streams this much whenever it is asked to measure, and a host takes what it wants:
    /// every bulk IN transfer gets as many of the bytes as it has room for, and the stream ends with the
    /// transfer that does not become full (an empty one, when the last byte filled its transfer). Afterwards,
    /// the endpoint has nothing to say. A new request drops what is left of the stream.
    std::uint64_t scanBytes = Protocol::ReadoutBytes;
    /// Bulk IN bytes per second while a transfer is pending; 0: as fast as memory.
    std::uint64_t bytesPerSecond = 0;
    /// Makes a measurement take its integration time before the first byte comes.
    bool takesIntegrationTime = false;

    /// Presses the button this long after each time that the instrument is claimed.
    std::optional<std::uint32_t> buttonAfterMilliseconds{};

    /// Called after the EEPROM changed, on the thread that brought the change.
    std::function<void()> memoryChanged{};
};

/// The first, second, ... of several instruments: serial, chip id and seed are its own. Counts from 0.
InstrumentSettings SettingsOfNumber(std::size_t index);

}  // namespace Varnholt::Simulator
