#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionalityByte.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The command set of one opened instrument, in host values. Open from construction until the last copy is
/// gone.
///
/// Takes no lock: an object and its copies serve one thread at a time. Failures are the exceptions of the
/// transport (`IOException`, `TimeoutException`, `DataException`), and `InvalidArgumentException` for data
/// whose length no command can carry; nothing is retried.
class PellandoFunctionality final {
  public:
    /// Opens the instrument with this index in the list of connected instruments and resets it. `listener` is
    /// not owned and may be null; it receives messages on another thread until `removeListener`.
    PellandoFunctionality(Generic::EventListener* listener, std::uint32_t deviceIndex);
    /// Takes an opened transport and resets the instrument.
    explicit PellandoFunctionality(
        const Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionalityByte>& transport);

    /// No message reaches the listener once this has returned.
    void removeListener(Generic::EventListener* listener);
    /// See `PellandoFunctionalityByte`.
    void SetScanReceiver(ScanReceiver* receiver);

    /// Takes one readout of `length` bytes into `buffer`; 256 bytes are 128 readings of 2 bytes, most
    /// significant byte first.
    void MeasureRequest(std::uint8_t* buffer, std::uint32_t length, std::uint32_t timeoutSeconds);
    /// - `p1` (0 to 65535): integration time, in time units of the measurement mode
    /// - `p2` (0 to 65535): a second time, in `m4` time units each
    /// - `p3`: a count; the memory model sends at most 256
    /// - `p4`: four flags, bits 0 to 3
    /// - `p5`: read only
    ///
    /// The meaning of `p3`, `p5` and the flags is the instrument's; they are carried as numbers.
    void SetMeasureParameters(std::uint16_t p1, std::uint16_t p2, std::uint16_t p3, std::uint8_t p4);
    void GetMeasureParameters(std::uint16_t& p1, std::uint16_t& p2, std::uint16_t& p3, std::uint8_t& p4,
                              std::uint8_t& p5);
    /// Modes count from 1.
    void SetMeasureMode(std::uint8_t mode);
    /// - `m1`: the number of modes
    /// - `m2`: the current mode, from 1
    /// - `m3`: carried as a number
    /// - `m4`: time units in one unit of the second time (130 in the first mode)
    /// - `m5`: length of a time unit in microseconds (68 in the first mode)
    /// - `m6`: flags; bit 0 is what `PellandoRAM::IsInPerfectMode` tells
    void GetMeasureMode(std::uint8_t& m1, std::uint8_t& m2, std::uint8_t& m3, std::uint8_t& m4,
                        std::uint8_t& m5, std::uint8_t& m6);

    /// Writes `data` at `address` in pieces of at most 256 bytes, in order; a failure leaves the pieces
    /// before it written. Empty data sends nothing.
    void WriteEEPROM(std::uint32_t address, const std::vector<std::uint8_t>& data);
    /// Fills `data`, whose size says how many bytes are wanted (at least 1). The instrument is asked for the
    /// next multiple of 64 bytes. After a failure `data` has its size and undefined content.
    void ReadEEPROM(std::uint32_t address, std::vector<std::uint8_t>& data);

    /// Three registers of the programmable logic, whose meaning is the instrument's.
    void WriteCPLD(std::uint16_t c1, std::uint16_t c2, std::uint16_t c3);
    /// The first of them.
    void ReadCPLD(std::uint16_t& value);

    /// `image` holds 1 to 65535 bytes.
    void DownloadFirmware(std::uint16_t address, const std::vector<std::uint8_t>& image, bool toEEPROM);

    /// `m2` is the firmware version (301 and later have measurement modes); the others are carried as
    /// numbers.
    void GetMISC(std::uint8_t& m1, std::uint16_t& m2, std::uint8_t& m3, std::uint16_t& m4, std::uint16_t& m5);
    void GetDeviceIdentifier(std::string& identifier);
    /// The low byte of `code` is sent. Opening sends 31.
    void Reset(std::uint16_t code);

    /// Runs a whole scan; its data wait for `GetScanData`. `recordSize` in bytes; `total` bytes, 0: until the
    /// instrument stops.
    void StartScan(std::uint32_t recordSize, std::uint32_t timeoutSeconds, std::uint32_t total);
    /// Copies the next `size` bytes into `buffer`; `size` becomes 0 when nothing is left.
    void GetScanData(std::uint8_t* buffer, std::uint32_t& size);

  private:
    Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionalityByte> implementation_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
