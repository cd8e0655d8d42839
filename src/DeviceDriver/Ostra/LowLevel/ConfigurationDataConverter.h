#pragma once

#include <cstdint>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Property.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// What is known of each property identifier: which part of the instrument's memory it belongs to, its type,
/// its default, and how its value travels: 4 bytes for each element, most significant byte first.
class ConfigurationDataConverter final {
  public:
    ConfigurationDataConverter() = delete;

    /// As bits.
    enum Category : unsigned {
        None = 0,
        Calibration = 1U << 0,
        Log = 1U << 1,
        Misc = 1U << 2,
        Special = 1U << 3,
        Measure = 1U << 4,
        Reset = 1U << 5,
        Cpld = 1U << 6,
        FirmwareDownload = 1U << 7,
        ModeDependent = 1U << 8,
    };
    static bool Belongs(std::uint16_t id, Category category);

    /// Plain predicates; an unknown identifier belongs nowhere. An identifier belongs to at most one of them,
    /// except that the special ones are calibration parameters, and the measure parameters (among others)
    /// depend on the measurement mode.
    static bool IsCalibrationParameter(std::uint16_t id) { return Belongs(id, Calibration); }
    static bool IsLogParameter(std::uint16_t id) { return Belongs(id, Log); }
    static bool IsMiscParameter(std::uint16_t id) { return Belongs(id, Misc); }
    static bool IsSpecialParameter(std::uint16_t id) { return Belongs(id, Special); }
    static bool IsMeasureParameter(std::uint16_t id) { return Belongs(id, Measure); }
    static bool IsResetParameter(std::uint16_t id) { return Belongs(id, Reset); }
    static bool IsCPLDParameter(std::uint16_t id) { return Belongs(id, Cpld); }
    static bool IsFirmwareDownloadParameter(std::uint16_t id) { return Belongs(id, FirmwareDownload); }
    static bool IsModeDependent(std::uint16_t id) { return Belongs(id, ModeDependent); }

    /// Zeros of the identifier's type and element count. An identifier without a default is refused with
    /// `DataException` "invalid property id N".
    static Generic::Configuration::Property GetDefaultProperty(std::uint16_t id);

    /// Refills `entry`, which keeps its type; its element count becomes that of the bytes.
    static void ByteArrayToConfigurationDataEntry(const std::vector<std::uint8_t>& bytes,
                                                  Generic::Configuration::Property& entry);
    static void ConfigurationDataEntryToByteArray(const Generic::Configuration::Property& entry,
                                                  std::vector<std::uint8_t>& bytes);
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
