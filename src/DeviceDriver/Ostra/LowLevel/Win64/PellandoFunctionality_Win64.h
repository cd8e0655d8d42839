#pragma once

#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/InterruptListener_Win64.h"
#include "DeviceDriver/Ostra/LowLevel/Win64/ScanBuffer.h"
#include "Protocol/Instrument.h"
#include "UsbIo/CUsbIoPipe.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The command set over the USBIO driver: vendor requests on endpoint 0, bulk data on two bound pipes.
///
/// A scan is read with two 64 KiB transfers in flight into one buffer, which `GetScanData` hands out in
/// pieces. The first transfer that comes back short or empty is the scan's end; what the one behind it may
/// have caught before it was cancelled belongs to no scan and is dropped. A scan that fails leaves no data.
class PellandoFunctionality_Win64 final : public PellandoFunctionalityByte {
  public:
    PellandoFunctionality_Win64(Generic::EventListener* listener, std::uint32_t deviceIndex);
    ~PellandoFunctionality_Win64() override;
    PellandoFunctionality_Win64(const PellandoFunctionality_Win64&) = delete;
    PellandoFunctionality_Win64& operator=(const PellandoFunctionality_Win64&) = delete;

    /// Any listener is taken away, whatever the argument. May be called from inside a message.
    void RemoveListener(Generic::EventListener* listener) override;

    /// The record size is not used by this transport, the time-out only with a receiver. An open-ended scan
    /// (`total` 0) sounds a beep 370 ms after its start, from a thread that outlives the call by at most half
    /// a second.
    void StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds, std::uint32_t total) override;
    /// Where fewer than `*size` bytes remain, those are copied and `*size` becomes their number.
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

    /// The address travels as the request's value.
    void DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image, std::uint32_t count) override;
    void DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length, const std::uint8_t* image,
                                std::uint32_t count) override;

    void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) override;
    void GetChipID(std::uint8_t* id) override;
    void Reset(const Bytes2& code) override;
    void GetDeviceIdentifier(std::string& identifier) override;

  private:
    using Bytes = std::vector<std::uint8_t>;

    void InitUSBIO(std::uint32_t deviceIndex);
    void Configure(int deviceNumber, Platform::DeviceList list);

    void VendorOutRequest(Protocol::Request request, const Bytes& data, std::uint16_t value = 0);
    /// Fills `data`; bytes that the instrument did not send are left as they are.
    void VendorInRequest(Protocol::Request request, Bytes& data);
    void WriteMemory(Protocol::Request request, const Bytes4& address, const Bytes2& length,
                     const std::uint8_t* data, std::uint32_t count);
    void ReadData(std::uint8_t* buffer, std::uint32_t length, std::uint64_t timeout);
    void WriteData(const std::uint8_t* buffer, std::uint32_t length);

    void PrepareScan(std::uint32_t total);
    bool IsFixedSize() const { return scanTotal_ != 0; }
    void ReadMeasureData();
    /// True while the scan goes on.
    bool ReadMeasureDataInternal(UsbIo::CUsbIoBuffer& current, UsbIo::CUsbIoBuffer& next);
    void TakeScanData(const UsbIo::CUsbIoBuffer& buffer);
    void CopyDataToBufferInternal(const UsbIo::CUsbIoBuffer& buffer);
    static void StartBeep();
    static void BeepTask();

    // In the order that their destruction needs, last first: the listener's thread, pipes, device.
    const Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIo> device_;
    const Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe> writePipe_;
    const Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe> readPipe_;
    const Varnholt::Utilities::Tools::SmartPointer<UsbIo::CUsbIoPipe> interruptPipe_;
    Varnholt::Utilities::Tools::SmartPointer<InterruptListener_Win64> interruptListener_;
    std::string devicePath_;

    ScanBuffer scanData_;              ///< of the last scan
    std::uint64_t received_ = 0;       ///< bytes that the running scan has brought
    std::uint32_t readPosition_ = 0;   ///< next byte that `GetScanData` hands out
    std::uint32_t scanEnd_ = 0;        ///< bytes that it can hand out
    std::uint32_t scanTotal_ = 0;      ///< bytes that the running scan was asked for; 0: any number
    std::uint32_t receiverLimit_ = 0;  ///< milliseconds for a transfer of a scan that has a receiver
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
