#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "AnswerStream.h"
#include "InstrumentSettings.h"
#include "MemoryWrite.h"
#include "Platform/Usb/UsbDevice.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Simulator {

/// The volatile values that the host sets and reads.
struct MeasureParameters {
    std::uint16_t p1 = 294;
    std::uint16_t p2 = 0;
    std::uint16_t p3 = 1;
    std::uint8_t p4 = 0;
    bool operator==(const MeasureParameters&) const = default;
};

/// The instrument behind its USB endpoints: memory, parameters, and what its vendor requests do to them.
class Commands final {
  public:
    /// `instrumentSettings` must outlive the object.
    explicit Commands(const InstrumentSettings& instrumentSettings);
    Commands(const Commands&) = delete;
    Commands& operator=(const Commands&) = delete;

    /// A vendor request from the host with its data stage; false: refused.
    bool Out(const Platform::Usb::SetupPacket& setup, std::span<const std::uint8_t> data);
    static constexpr std::size_t LongestAnswer = Protocol::DataStage::MeasureParametersSize;
    /// A vendor request for an answer: its bytes, or nothing when refused.
    std::optional<std::size_t> In(const Platform::Usb::SetupPacket& setup,
                                  std::span<std::uint8_t, LongestAnswer> answer);

    /// Forgets what was set and downloaded into RAM; the EEPROM stays.
    void PowerOff();

    AnswerStream& Answers() { return answers_; }  ///< for bulk IN
    MemoryWrite& Write() { return write_; }       ///< from bulk OUT

    // What a test looks at.
    std::vector<std::uint8_t> eeprom;
    std::vector<std::uint8_t> eepromFirmware;
    std::vector<std::uint8_t> ramFirmware;
    MeasureParameters parameters;
    std::uint8_t mode = 1;
    std::array<std::uint16_t, 3> cpld{};
    std::uint64_t measurements = 0;
    std::uint64_t resets = 0;
    std::uint8_t lastResetCode = 0;
    std::uint64_t buttonReports = 0;

    /// How the next measurement is taken.
    Exposure NextExposure() const;

  private:
    bool HasModes() const;
    const MeasureMode& CurrentMode() const;
    bool SetParameters(std::span<const std::uint8_t> data);
    bool SetMode(std::span<const std::uint8_t> data);
    bool WriteCpld(std::span<const std::uint8_t> data);
    bool DownloadToRam(std::uint16_t address, std::span<const std::uint8_t> data);
    bool Reset(std::span<const std::uint8_t> data);
    std::size_t AnswerMode(std::span<std::uint8_t, LongestAnswer> answer) const;
    /// What a request names of a memory of so many bytes; nothing where it is not all inside.
    struct Area {
        std::uint32_t address;
        std::uint32_t length;
    };
    static std::optional<Area> AreaOf(std::span<const std::uint8_t> data, std::size_t memorySize);
    bool StartWrite(std::vector<std::uint8_t>& memory, std::span<const std::uint8_t> data);
    bool StartRead(std::span<const std::uint8_t> data);

    const InstrumentSettings& settings_;
    const SensorModel sensor_;
    AnswerStream answers_;
    MemoryWrite write_;
};

}  // namespace Varnholt::Simulator
