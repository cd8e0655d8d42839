#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"
#include "DeviceDriver/Ostra/LowLevel/Win32/ScanRecord.h"
#include "Protocol/Instrument.h"
#include "Protocol/NativeDriver.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

class PellandoUSBDevice;

/// The command set over the instrument's own kernel driver. Each command is a vendor request on the control
/// pipe; some are followed by bulk transfers, which are not started when the request failed.
///
/// One command record serves all commands and keeps what they leave in it: a command writes the fields that
/// it names, and sends the rest as an earlier command left it.
class PellandoFunctionality_PC final : public PellandoFunctionalityByte {
  public:
    /// `IOException` "No devices connected" or "No such device connected", or what opening it throws.
    PellandoFunctionality_PC(Generic::EventListener* listener, std::uint32_t deviceIndex);
    /// Closes the instrument.
    ~PellandoFunctionality_PC() override;
    PellandoFunctionality_PC(const PellandoFunctionality_PC&) = delete;
    PellandoFunctionality_PC& operator=(const PellandoFunctionality_PC&) = delete;

    void RemoveListener(Generic::EventListener* listener) override;

    /// Runs at raised thread priority. A scan that fails leaves no records. `recordSize` 1 to 6553.
    void StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds, std::uint32_t total) override;
    /// One record per call. Asked for more than the record holds it gives the record and sets `*size` to its
    /// size; what a smaller buffer does not take is dropped.
    void GetScanData(std::uint8_t* buffer, std::uint32_t* size) override;

    void MeasureRequest(std::uint8_t* buffer, std::uint32_t length, std::uint32_t timeoutSeconds) override;
    void SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3, std::uint8_t p4) override;
    void GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                              std::uint8_t& p5) override;
    void SetMeasureMode(std::uint8_t mode) override;
    void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                        std::uint8_t& m5, std::uint8_t& m6) override;
    void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                     std::uint32_t count) override;
    void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                    std::uint32_t count) override;
    void WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) override;
    void ReadCPLD(Bytes2& value) override;
    void DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image, std::uint32_t count) override;
    void DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length, const std::uint8_t* image,
                                std::uint32_t count) override;
    void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) override;
    void GetChipID(std::uint8_t* id) override;
    void Reset(const Bytes2& code) override;
    void GetDeviceIdentifier(std::string& identifier) override;

    /// The shared body of the two EEPROM-type writes: the request, the data, and two bytes of 0 behind them.
    virtual void WriteEEPROM(Protocol::Request request, const Bytes4& address, const Bytes2& length,
                             const std::uint8_t* data, std::uint32_t count);

    /// The path of the instrument with this index.
    static std::string GetDeviceAddress(std::uint32_t deviceIndex);

  private:
    static constexpr std::size_t DataAreaSize = 8;

    struct CommandRecord {
        Protocol::NativeDriver::ControlBlock block{};
        std::array<std::uint8_t, DataAreaSize> data{};
    };
    static_assert(sizeof(CommandRecord) == Protocol::NativeDriver::ControlBlockSize + DataAreaSize);

    /// Sends the first `length` bytes of the data area.
    void Send(Protocol::Request request, std::uint32_t length);
    /// Fills the first `length` bytes of the data area.
    void Receive(Protocol::Request request, std::uint32_t length);
    void Transfer(Protocol::Request request, std::uint8_t direction, void* data, std::uint32_t length);

    void ReadStrip(std::uint32_t recordSize, std::uint32_t timeout, std::uint32_t total);

    template <std::size_t Size>
    void Put(std::size_t offset, const std::array<std::uint8_t, Size>& bytes);
    template <std::size_t Size>
    void Take(std::size_t offset, std::array<std::uint8_t, Size>& bytes) const;

    CommandRecord record_;
    ScanRecordList scanRecords_;
    const Varnholt::Utilities::Tools::SmartPointer<PellandoUSBDevice> device_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
