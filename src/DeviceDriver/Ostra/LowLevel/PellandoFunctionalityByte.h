#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "DeviceDriver/Generic/EventListener.h"
#include "DeviceDriver/Ostra/LowLevel/ScanReceiver.h"
#include "DeviceDriver/Ostra/Transport.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// A 16-bit value as it travels, most significant byte first.
using Bytes2 = std::array<std::uint8_t, 2>;
/// A 32-bit value as it travels, most significant byte first.
using Bytes4 = std::array<std::uint8_t, 4>;

/// The instrument's commands at byte level, as the two transports carry them. An implementation is built from
/// a listener (may be null, not owned) and a device index, opens that instrument in its constructor and
/// closes it in its destructor. One object serves one caller at a time.
///
/// Failures are exceptions: `IOException`, `TimeoutException`, `DataException`. Nothing is retried.
class PellandoFunctionalityByte {
  public:
    virtual ~PellandoFunctionalityByte() = default;

    /// Not owned; may be null, as it is at first, and change between commands. Without a receiver the data of
    /// a scan wait for `GetScanData`. With one nothing is kept; what a transfer brought that then failed is
    /// handed over too, before the failure leaves `StartScan`; each transfer of the scan gets the time-out
    /// plus 3000 ms on either transport; and an open-ended scan may be of any length.
    void SetScanReceiver(ScanReceiver* receiver) { scanReceiver_ = receiver; }
    /// From then on a command whose data did not move as a whole is a failure: `IOException` "M of N bytes
    /// came", with the numbers as its `MissingData`; scans are left alone. For whoever relies on what was
    /// read: a transport may call a read that brought less than it should a success, and leave the rest as it
    /// was.
    void RequireWholeData() { requiresWholeData_ = true; }

    /// No message reaches any listener once this has returned.
    virtual void RemoveListener(Generic::EventListener* listener) = 0;

    /// Runs a whole scan; its data wait for `GetScanData`. `recordSize` in bytes, time-out in seconds;
    /// `total` bytes, 0: until the instrument stops.
    virtual void StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds, std::uint32_t total) = 0;
    /// Copies the next `*size` bytes of the scan into `buffer`; `*size` becomes 0 when nothing is left.
    virtual void GetScanData(std::uint8_t* buffer, std::uint32_t* size) = 0;

    /// Takes one readout of `length` bytes into `buffer`.
    virtual void MeasureRequest(std::uint8_t* buffer, std::uint32_t length, std::uint32_t timeoutSeconds) = 0;
    virtual void SetMeasureParameters(const Bytes2& p1, const Bytes2& p2, const Bytes2& p3,
                                      std::uint8_t p4) = 0;
    virtual void GetMeasureParameters(Bytes2& p1, Bytes2& p2, Bytes2& p3, std::uint8_t& p4,
                                      std::uint8_t& p5) = 0;
    virtual void SetMeasureMode(std::uint8_t mode) = 0;
    virtual void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                                std::uint8_t& m5, std::uint8_t& m6) = 0;

    virtual void WriteEEPROM(const Bytes4& address, const Bytes2& length, const std::uint8_t* data,
                             std::uint32_t count) = 0;
    virtual void ReadEEPROM(const Bytes4& address, const Bytes2& length, std::uint8_t* data,
                            std::uint32_t count) = 0;

    virtual void WriteCPLD(const Bytes2& c1, const Bytes2& c2, const Bytes2& c3) = 0;
    virtual void ReadCPLD(Bytes2& value) = 0;

    virtual void DownloadRAMFirmware(std::uint16_t address, const std::uint8_t* image,
                                     std::uint32_t count) = 0;
    virtual void DownloadEEPROMFirmware(const Bytes4& address, const Bytes2& length,
                                        const std::uint8_t* image, std::uint32_t count) = 0;

    virtual void GetMISC(std::uint8_t& m1, Bytes2& m2, std::uint8_t& m3, Bytes2& m4, Bytes2& m5) = 0;
    /// `id` has room for 8 bytes.
    virtual void GetChipID(std::uint8_t* id) = 0;
    virtual void Reset(const Bytes2& code) = 0;
    /// The path of the instrument's device interface.
    virtual void GetDeviceIdentifier(std::string& identifier) = 0;

    /// Opens the instrument with this index over the transport of this host.
    static Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionalityByte> Instance(
        Generic::EventListener* listener, std::uint32_t deviceIndex);
    static Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionalityByte> Instance(
        Generic::EventListener* listener, std::uint32_t deviceIndex, Transport transport);

  protected:
    ScanReceiver* Receiver() const { return scanReceiver_; }
    /// Of a command, either way, once for each data stage that succeeded; not of a scan.
    void DataStageEnded(std::uint32_t asked, std::uint32_t moved) const;

  private:
    ScanReceiver* scanReceiver_ = nullptr;
    bool requiresWholeData_ = false;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
