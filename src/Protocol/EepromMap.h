#pragma once

#include <cstdint>

#include "Protocol/Instrument.h"

/// What lies where in the instrument's EEPROM: shared by the driver and the simulated instrument. Addresses
/// and sizes in bytes; every number is stored most significant byte first.
namespace Varnholt::Protocol::EepromMap {

/// The usage log, twice. The areas reach to the next one; what the log leaves of them belongs to others
/// below.
inline constexpr std::uint32_t MainLog = 0;
inline constexpr std::uint32_t LogCopy = 2048;
inline constexpr std::uint32_t LogArea = LogCopy - MainLog;
inline constexpr std::uint32_t LogSize = 1064;  ///< of a fresh instrument
/// Everything below belongs to the log, the binary block and the raw words.
inline constexpr std::uint32_t EndOfLogArea = 4096;

/// The binary block, in two parts behind the two logs.
inline constexpr std::uint32_t BinaryFirst = MainLog + LogSize;
inline constexpr std::uint32_t BinaryFirstSize = 984;
inline constexpr std::uint32_t BinarySecond = LogCopy + LogSize;
inline constexpr std::uint32_t BinarySecondSize = 920;
inline constexpr std::uint32_t BinarySize = BinaryFirstSize + BinarySecondSize;

/// Raw words; those beyond `EndOfLogArea` can be read but not written.
inline constexpr std::uint32_t RawWords = BinarySecond + BinarySecondSize;
inline constexpr std::uint32_t RawWordSize = 4;

/// The allocation table: a header of two 16-bit numbers, then entries.
inline constexpr std::uint32_t Table = 4096;
inline constexpr std::uint32_t TableArea = 512;
namespace TableLayout {
inline constexpr std::uint32_t Version = 0;
inline constexpr std::uint32_t Length = 2;  ///< of header and entries
inline constexpr std::uint32_t FirstEntry = 4;
inline constexpr std::uint32_t EntryIdentifier = 0;
inline constexpr std::uint32_t EntryAddress = 2;  ///< 32 bits
inline constexpr std::uint32_t EntrySize = 6;
inline constexpr std::uint16_t KnownVersion = 1;
inline constexpr std::uint16_t ShortestLength = 300;
inline constexpr std::uint16_t LongestLength = TableArea;
}  // namespace TableLayout

/// Table identifiers that are no property: the ends of the sections.
inline constexpr std::uint16_t EndOfMainLog = 1;
inline constexpr std::uint16_t EndOfCalibration = 2;
inline constexpr std::uint16_t EndOfLogCopy = 3;
/// The table files a value of the second log under its property identifier plus this.
inline constexpr std::uint16_t LogCopyIdOffset = 1000;

inline constexpr std::uint32_t Calibration = 4608;
inline constexpr std::uint32_t CalibrationSize = 148;  ///< of a fresh instrument

static_assert(BinaryFirst + BinaryFirstSize == LogCopy);
static_assert(RawWords == 4032);
static_assert(EndOfLogArea == Table && Table + TableArea == Calibration);
static_assert(Calibration + CalibrationSize <= EepromSize);

}  // namespace Varnholt::Protocol::EepromMap
