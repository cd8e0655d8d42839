#pragma once

#include <cstdint>

/// The property identifiers that code names, in the instrument's memory and in its parameters. The whole
/// list, with types and defaults, is `ConfigurationDataConverter`; most values are opaque.
namespace Varnholt::Protocol::PropertyIds {

/// Measurement parameters.
inline constexpr std::uint16_t FlagBit1 = 2000;
inline constexpr std::uint16_t SecondTime = 2001;  ///< seconds
inline constexpr std::uint16_t FlagBit2 = 2002;
inline constexpr std::uint16_t FlagBit3 = 2003;
inline constexpr std::uint16_t FlagBit0 = 2008;
inline constexpr std::uint16_t IntegrationTime = 2009;  ///< seconds
inline constexpr std::uint16_t ThirdParameter = 2010;
inline constexpr std::uint16_t FifthParameter = 2021;
/// Takes the place of `ThirdParameter` when it is positive and `FlagBit0` is set.
inline constexpr std::uint16_t ThirdParameterReplacement = 9189;

/// MISC values, and the two that follow from `Misc2`.
inline constexpr std::uint16_t Misc3 = 2004;
inline constexpr std::uint16_t Misc4 = 2006;
inline constexpr std::uint16_t Misc1 = 2012;
inline constexpr std::uint16_t Misc2 = 2013;
inline constexpr std::uint16_t Misc5 = 2020;
inline constexpr std::uint16_t FirstOfMisc2 = 2016;
inline constexpr std::uint16_t SecondOfMisc2 = 2017;

/// Instruments whose `Misc2` is this or more have several measurement modes.
inline constexpr std::uint16_t FirstMisc2WithModes = 301;

/// The usage log.
inline constexpr std::uint16_t LogChecksum = 10000;

/// Raw EEPROM areas.
inline constexpr std::uint16_t BinaryBlock = 10100;
inline constexpr std::uint16_t FirstRawWord = 10200;
inline constexpr std::uint16_t LastRawWord = 10239;

/// Requests to the EEPROM image; they hold no value.
inline constexpr std::uint16_t WriteThroughRequest = 20001;
inline constexpr std::uint16_t DumpLogRequest = 20002;

}  // namespace Varnholt::Protocol::PropertyIds
