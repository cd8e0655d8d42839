#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "Protocol/Guid.h"

/// The interface of the instrument's own kernel driver.
namespace Varnholt::Protocol::NativeDriver {

/// {00873FDF-61A8-11D1-AA5E-00C04FB1728B}
inline constexpr Guid InterfaceClass{
    0x00873FDF, 0x61A8, 0x11D1, {0xAA, 0x5E, 0x00, 0xC0, 0x4F, 0xB1, 0x72, 0x8B}};

/// Device controls; each takes a control block.
inline constexpr std::uint32_t ControlVendorRequest = 0x22000D;  ///< a vendor request with its data stage
inline constexpr std::uint32_t ControlAbortPipe = 0x220009;      ///< value names the endpoint; sent when an
                                                                 ///< untouched instrument is closed
inline constexpr std::uint32_t ControlButtonReport = 0x220011;   ///< request 0xD0, value 3; sent then as well

/// The control block, 10 bytes; 16-bit numbers little-endian.
inline constexpr std::size_t ControlBlockSize = 10;
using ControlBlock = std::array<std::uint8_t, ControlBlockSize>;
namespace Block {
inline constexpr std::size_t Direction = 0;  ///< 0 host to instrument, 1 instrument to host
inline constexpr std::size_t Type = 1;       ///< 2 vendor
inline constexpr std::size_t Recipient = 2;  ///< 0 device
inline constexpr std::size_t Reserved = 3;
inline constexpr std::size_t Request = 4;
inline constexpr std::size_t Padding = 5;
inline constexpr std::size_t Value = 6;  ///< 2 bytes
inline constexpr std::size_t Index = 8;  ///< 2 bytes
}  // namespace Block

inline constexpr std::uint8_t DirectionOut = 0;
inline constexpr std::uint8_t DirectionIn = 1;
inline constexpr std::uint8_t TypeVendor = 2;

/// Pipe n (1 to 3) is the device path followed by "\PIPE0" and the digit; pipe 0 is the device itself.
inline constexpr const char* PipeSuffix = "\\PIPE0";
inline constexpr std::uint32_t ControlPipe = 0;
inline constexpr std::uint32_t ReadPipe = 1;       ///< endpoint 0x82
inline constexpr std::uint32_t WritePipe = 2;      ///< endpoint 0x03
inline constexpr std::uint32_t InterruptPipe = 3;  ///< endpoint 0x84

struct PipePath {
    std::string_view device;
    std::uint32_t pipe;
};
/// What a path names; any other path is that of a device.
constexpr PipePath SplitPipePath(std::string_view path) {
    constexpr std::string_view suffix = PipeSuffix;
    const std::size_t end = path.rfind(suffix);
    const bool isPipe = end != path.npos && path.size() - end == suffix.size() + 1 && path.back() >= '1' &&
                        path.back() <= '3';
    return isPipe ? PipePath{path.substr(0, end), static_cast<std::uint32_t>(path.back() - '0')}
                  : PipePath{path, ControlPipe};
}

}  // namespace Varnholt::Protocol::NativeDriver
