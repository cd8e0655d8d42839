#pragma once

#include <cstdint>

/// What the instrument understands on its USB endpoints: shared by the driver and the simulated instrument.
namespace Varnholt::Protocol {

/// Vendor requests (USB request type 0x40 out, 0xC0 in, recipient device). Multi-byte numbers in the data
/// stage are sent most significant byte first. The comment gives the data stage's bytes.
enum class Request : std::uint8_t {
    DownloadRamFirmware = 0xA0,  ///< out: the image; setup value = RAM address
    Measure = 0xC0,  ///< out, no data; then bulk in on 0x82 (one readout, or the stream of a scan)
    SetMeasureParameters = 0xC1,    ///< out 8: p1 (2), p2 (2), p3 (2), p4 (1), unused (1)
    GetMeasureParameters = 0xC2,    ///< in 8: p1 (2), p2 (2), p3 (2), p4 (1), p5 (1)
    WriteEeprom = 0xC3,             ///< out 8: address (4), length (2), unused (2); then bulk out on 0x03
    ReadEeprom = 0xC4,              ///< out 8: address (4), length (2), unused (2); then bulk in on 0x82
    WriteCpld = 0xC7,               ///< out 6: three values (2 each)
    ReadCpld = 0xC8,                ///< in 2
    GetMisc = 0xC9,                 ///< in 8: m2 (2), m4 (2), m5 (2), m1 (1), m3 (1)
    Reset = 0xCA,                   ///< out 1: reset code
    DownloadEepromFirmware = 0xCB,  ///< as WriteEeprom
    SetMeasureMode = 0xCF,          ///< out 1: mode
    ButtonReport = 0xD0,            ///< sent by the native driver's control 0x220011; value 3, no fixed data
    GetMeasureMode = 0xD1,          ///< in 6
    GetChipId = 0xD2,               ///< in 8
};

/// What lies where in the data stages, and the stages' sizes.
namespace DataStage {
enum : std::uint32_t { P1 = 0, P2 = 2, P3 = 4, P4 = 6, P5 = 7, MeasureParametersSize = 8 };
enum : std::uint32_t { Address = 0, Length = 4, MemoryRequestSize = 8 };
enum : std::uint32_t { C1 = 0, C2 = 2, C3 = 4, WriteCpldSize = 6, ReadCpldSize = 2 };
enum : std::uint32_t { M2 = 0, M4 = 2, M5 = 4, M1 = 6, M3 = 7, MiscSize = 8 };
enum : std::uint32_t { MeasureModeSize = 6, ChipIdSize = 8, ResetSize = 1, SetModeSize = 1 };
}  // namespace DataStage

inline constexpr std::uint8_t VendorOut = 0x40;
inline constexpr std::uint8_t VendorIn = 0xC0;

inline constexpr std::uint8_t BulkOutEndpoint = 0x03;
inline constexpr std::uint8_t BulkInEndpoint = 0x82;
inline constexpr std::uint8_t InterruptInEndpoint = 0x84;

inline constexpr std::uint32_t EepromSize = 8192;
/// Largest piece of one EEPROM write, and the multiple that reads are padded to.
inline constexpr std::uint32_t EepromWritePiece = 256;
inline constexpr std::uint32_t EepromReadUnit = 64;

/// A readout: 128 big-endian 16-bit values.
inline constexpr std::uint32_t ReadoutValues = 128;
inline constexpr std::uint32_t ReadoutBytes = ReadoutValues * 2;

/// The reset that every opening sends.
inline constexpr std::uint16_t OpeningResetCode = 31;

/// The tone at the first data of a scan.
inline constexpr std::uint32_t BeepFrequency = 2140;  // Hz
inline constexpr std::uint32_t BeepDuration = 75;     // ms

}  // namespace Varnholt::Protocol
