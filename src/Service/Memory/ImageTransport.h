#pragma once

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"
#include "Service/Memory/EepromImage.h"

namespace Varnholt::Service {

/// An EEPROM image in the place of an instrument: what reads and writes the EEPROM works on it unchanged.
/// Every other command but the reset, which does nothing, is refused with `IOException`, and so is an access
/// that is not wholly inside the image.
class ImageTransport : public DeviceDriver::Ostra::LowLevel::PellandoFunctionalityByte {
  public:
    using Bytes2 = DeviceDriver::Ostra::LowLevel::Bytes2;
    using Bytes4 = DeviceDriver::Ostra::LowLevel::Bytes4;

    /// `contents` must outlive the object.
    explicit ImageTransport(EepromImage& contents) : image_(contents) {}

    void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                     std::uint32_t count) override;
    void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                    std::uint32_t count) override;
    void Reset(const Bytes2&) override {}
    void RemoveListener(DeviceDriver::Generic::EventListener*) override {}

    void StartScan(std::uint32_t, std::uint32_t, std::uint32_t) override { Refuse(); }
    void GetScanData(std::uint8_t*, std::uint32_t*) override { Refuse(); }
    void MeasureRequest(std::uint8_t*, std::uint32_t, std::uint32_t) override { Refuse(); }
    void SetMeasureParameters(const Bytes2&, const Bytes2&, const Bytes2&, std::uint8_t) override {
        Refuse();
    }
    void GetMeasureParameters(Bytes2&, Bytes2&, Bytes2&, std::uint8_t&, std::uint8_t&) override { Refuse(); }
    void SetMeasureMode(std::uint8_t) override { Refuse(); }
    void GetMeasureMode(std::uint8_t&, std::uint8_t&, std::uint8_t&, std::uint8_t&, std::uint8_t&,
                        std::uint8_t&) override {
        Refuse();
    }
    void WriteCPLD(const Bytes2&, const Bytes2&, const Bytes2&) override { Refuse(); }
    void ReadCPLD(Bytes2&) override { Refuse(); }
    void DownloadRAMFirmware(std::uint16_t, const std::uint8_t*, std::uint32_t) override { Refuse(); }
    void DownloadEEPROMFirmware(const Bytes4&, const Bytes2&, const std::uint8_t*, std::uint32_t) override {
        Refuse();
    }
    void GetMISC(std::uint8_t&, Bytes2&, std::uint8_t&, Bytes2&, Bytes2&) override { Refuse(); }
    void GetChipID(std::uint8_t*) override { Refuse(); }
    void GetDeviceIdentifier(std::string& identifier) override { identifier.clear(); }

  private:
    [[noreturn]] static void Refuse();
    std::uint8_t* Place(const Bytes4& address, std::uint32_t count) const;

    EepromImage& image_;
};

}  // namespace Varnholt::Service
