#pragma once

#include <memory>

#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "Service/Memory/EepromImage.h"

namespace Varnholt::Service {

/// The memory model of an image. It works on a copy, so that what the model writes of its own accord (the
/// log, when it ends) reaches nobody.
class ImageModel final {
  public:
    using Properties = DeviceDriver::Generic::Configuration::Properties;
    using Memory = DeviceDriver::Ostra::LowLevel::PellandoEEPROM;

    /// Throws what the memory model throws of an image that it cannot use.
    explicit ImageModel(EepromImage image);
    ImageModel(const ImageModel&) = delete;
    ImageModel& operator=(const ImageModel&) = delete;

    Memory& Get() { return *memory_; }
    /// The copy, with what the model has written to it so far.
    const EepromImage& Contents() const { return contents_; }

    Properties Calibration() { return LoadSet("CalibrationData"); }
    Properties Log() { return LoadSet("LogData"); }
    Properties Table() { return LoadSet("EATData"); }

  private:
    Properties LoadSet(const char* name);

    EepromImage contents_;
    std::unique_ptr<Memory> memory_;
};

/// Whether two sets hold the same values, byte for byte, in the same order.
bool HaveSameBytes(const DeviceDriver::Generic::Configuration::Properties& a,
                   const DeviceDriver::Generic::Configuration::Properties& b);

/// The allocation table of an image; throws what the memory model throws of one that it cannot use.
DeviceDriver::Ostra::LowLevel::PellandoEAT TableOf(const EepromImage& image);

/// Whether what the driver writes as the log's two copies is where the table says. A second copy that the
/// table does not have at all is in nobody's way.
struct LogPlaces {
    bool main, second;
};
LogPlaces PlacesOf(const DeviceDriver::Ostra::LowLevel::PellandoEAT& table,
                   const DeviceDriver::Generic::Configuration::Properties& items);

/// The two copies of the usage log, each on its own.
struct LogCopy {
    bool isReadable = false;  ///< the table says where its values are
    bool isValid = false;     ///< its checksum is right
    std::uint32_t stored = 0;
    std::uint32_t calculated = 0;
    DeviceDriver::Generic::Configuration::Properties items;
};
struct LogCopies {
    LogCopy main, second;

    /// What the driver uses: "main copy", "second copy" or "an empty log".
    const char* Used() const;
};
/// Of an image whose table can be used.
LogCopies ReadLogCopies(const EepromImage& image);

/// The image of an instrument that was never used, made by the memory model's own tables.
EepromImage FreshImage();

}  // namespace Varnholt::Service
