#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The EEPROM of one opened instrument: read as a whole at construction, then served from memory by property
/// identifier. Calibration values change in memory only, until a caller writes an image made by `Dump` to the
/// instrument; the log is written, twice, by `DumpLog` and whatever leads to it. The binary block and the raw
/// words are read and written directly.
///
/// An object whose image was written to its instrument must be made anew: it knows the instrument's EEPROM as
/// it was read, and its end would write the log as that stood.
///
/// A refusal is `ResourceException`; failures of transfers pass through. One thread at a time.
class PellandoEEPROM {
  public:
    using Property = Generic::Configuration::Property;
    using Properties = Generic::Configuration::Properties;

    /// Reads the EEPROM in two transfers of 4096 bytes. A table that cannot be used is refused with
    /// `DataException` "corrupt EAT detected!!", or "id N doesn't exist" where it lacks what it must have.
    explicit PellandoEEPROM(
        const Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality>& instrument);
    PellandoEEPROM(const PellandoEEPROM&) = delete;
    PellandoEEPROM& operator=(const PellandoEEPROM&) = delete;
    /// Writes the log, always, and throws nothing: who has to know calls `DumpLog` before.
    virtual ~PellandoEEPROM();

    virtual PellandoLog& GetLog();
    /// With the flag, dumps the log first where it recommends that.
    virtual PellandoLog& GetLog(bool dumpIfRecommended);

    /// A log or calibration value; any other identifier is refused: "unknown property id = N".
    virtual const Property& Load(std::uint16_t id);
    /// Fills the set and answers it. An empty set is replaced by a copy of what its name says:
    /// "CalibrationData", "LogData" or "EATData" (addresses by table identifier). Otherwise each log and
    /// calibration identifier in it gets its value; the requests 20001 and 20002 are refused as `Load` of an
    /// identifier is; others are left alone.
    virtual Properties& Load(Properties& set);
    /// Sets each log and calibration value of the set. Then, if 20002 is 1, dumps the log; otherwise, if
    /// 20001 is 1, sets it to 0 and writes through, which dumps the log as well. A write-through that fails
    /// passes on what failed, and leaves the object locked: it must not stay open to other writes.
    virtual void Store(Properties& set);
    /// 10100: exactly 1904 bytes, "Wrong Tallimer size" otherwise, written in two parts. 10200 to 10215: the
    /// data from the word's address on; data that would end beyond address 4095, and the words from 10216 on,
    /// are refused with "EEPROM access denied". Any other identifier: nothing happens. Not subject to `Lock`.
    virtual void StoreBinary(std::uint16_t id, const std::vector<std::uint8_t>& data);
    /// 10100: 1904 bytes. 10200 to 10239: 4 bytes. Any other identifier: none.
    virtual std::vector<std::uint8_t> LoadBinary(std::uint16_t id);
    /// The image of the current contents, 8192 bytes; unused bytes, the binary block and the raw words are
    /// 0xFF. Behind a value that has changed its size the later ones move, and with them the section's end,
    /// which gives the last value its size; the entries of the second log move as those of the main one. The
    /// instrument is not written to, except for a log whose dump is due.
    ///
    /// The values lie one behind the other from their areas' beginnings on. Whether the table says so is for
    /// the caller to check before such an image is written anywhere. Values that have outgrown their area in
    /// the image, and values that the table lacks, are refused with `ResourceException`.
    virtual std::vector<std::uint8_t> Dump();

    const Property& GetProperty(std::uint16_t id);
    /// In memory. A due dump of the log happens before a log value is set. Other identifiers are ignored.
    void SetProperty(std::uint16_t id, const Property& value);

    /// Guards `WriteThrough`; locked at construction. Locking what is locked is refused, and unlocking what
    /// is not.
    void Lock();
    void Unlock();
    void ThrowIfLocked() const;
    void WriteThrough();
    /// Writes the log to both its places, at 0 and at 2048, the main copy first. After a failure in the first
    /// write the second copy is the old one.
    ///
    /// One thing is refused, with `ResourceException` and before anything is written or forgotten: a log that
    /// has grown beyond the 1064 bytes of its area (or the size it was read with, where that is more, up to
    /// 2048), as it would overwrite what lies behind it. It can be made smaller through `GetLog`.
    void DumpLog();

    /// Reads the calibration values out of an image of 8192 bytes.
    void SetupCalibrationData(const std::vector<std::uint8_t>& image);

    static bool IsEEPROMProperty(std::uint16_t id);

  private:
    Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality> functionality_;
    bool locked_ = true;
    Varnholt::Utilities::Tools::SmartPointer<PellandoLog> log_;
    Varnholt::Utilities::Tools::SmartPointer<PellandoEAT> eat_;
    std::size_t logArea_ = 0;  ///< bytes that the log may take in the instrument
    Properties calibration_;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
