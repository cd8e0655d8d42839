#pragma once

#include <cstddef>
#include <cstdint>

#include "Protocol/Guid.h"

/// The programming interface of the USBIO kernel driver, as far as it is used.
namespace Varnholt::Protocol::UsbIoDriver {

/// {989D6515-E122-4442-A357-751457F102A5}
inline constexpr Guid InterfaceClass{
    0x989D6515, 0xE122, 0x4442, {0xA3, 0x57, 0x75, 0x14, 0x57, 0xF1, 0x02, 0xA5}};

namespace Control {
inline constexpr std::uint32_t SetConfiguration = 0x80942024;
inline constexpr std::uint32_t UnconfigureDevice = 0x80942028;
inline constexpr std::uint32_t ClassOrVendorInRequest = 0x80942032;
inline constexpr std::uint32_t ClassOrVendorOutRequest = 0x80942035;
inline constexpr std::uint32_t GetDeviceParameters = 0x8094203C;
inline constexpr std::uint32_t SetDeviceParameters = 0x80942040;
inline constexpr std::uint32_t GetDriverInfo = 0x8094206C;
inline constexpr std::uint32_t BindPipe = 0x80942078;
inline constexpr std::uint32_t AbortPipe = 0x80942084;
}  // namespace Control

/// Status codes that are named in code; `CUsbIo::ErrorText` has the texts of all.
namespace Status {
inline constexpr std::uint32_t Success = 0;
inline constexpr std::uint32_t TransactionError = 0xE0000011;
inline constexpr std::uint32_t BabbleDetected = 0xE0000012;
inline constexpr std::uint32_t EndpointHalted = 0xE0000030;
inline constexpr std::uint32_t NoMemory = 0xE0000100;
inline constexpr std::uint32_t RequestFailed = 0xE0000500;
inline constexpr std::uint32_t DeviceGone = 0xE0007000;
inline constexpr std::uint32_t Cancelled = 0xE0010000;
inline constexpr std::uint32_t Failed = 0xE0001000;
inline constexpr std::uint32_t InputBufferTooSmall = 0xE0001001;
inline constexpr std::uint32_t OutputBufferTooSmall = 0xE0001002;
inline constexpr std::uint32_t AlreadyConfigured = 0xE0001005;
inline constexpr std::uint32_t NotConfigured = 0xE0001006;
inline constexpr std::uint32_t OpenPipes = 0xE0001007;
inline constexpr std::uint32_t AlreadyBound = 0xE0001008;
inline constexpr std::uint32_t NotBound = 0xE0001009;
inline constexpr std::uint32_t DeviceRemoved = 0xE000100A;
inline constexpr std::uint32_t ControlNotSupported = 0xE000100B;
inline constexpr std::uint32_t TimedOut = 0xE000100C;
inline constexpr std::uint32_t InvalidRecipient = 0xE000100D;
inline constexpr std::uint32_t InvalidType = 0xE000100E;
inline constexpr std::uint32_t InvalidDirection = 0xE0001010;
inline constexpr std::uint32_t PipeNotFound = 0xE0001013;
inline constexpr std::uint32_t InterfaceNotFound = 0xE0001016;
inline constexpr std::uint32_t InvalidParameter = 0xE0001018;
inline constexpr std::uint32_t DevicePoweredDown = 0xE000101B;
inline constexpr std::uint32_t VersionMismatch = 0xE000101C;
inline constexpr std::uint32_t UserEvent =
    0xE000101E;  ///< the caller's own event ended the wait; has no text
inline constexpr std::uint32_t OpenedByOtherProcess = 0xE0001021;
inline constexpr std::uint32_t DeviceNotFound = 0xE0001100;
inline constexpr std::uint32_t DeviceNotOpen = 0xE0001102;
inline constexpr std::uint32_t NoSuchDeviceInstance = 0xE0001104;
inline constexpr std::uint32_t InvalidFunctionParameter = 0xE0001105;
inline constexpr std::uint32_t NoEnumeration = 0xE0001106;  ///< setupapi cannot be had; has no text
inline constexpr std::uint32_t AlreadyOpen = 0xE0001107;
}  // namespace Status

/// Driver information: 12 bytes, the first two the interface version (little-endian).
inline constexpr std::size_t DriverInfoSize = 12;
inline constexpr std::uint16_t InterfaceVersion = 0x0230;

/// Configuration block, 260 bytes: configuration index (2), number of entries (2), then 32 interface entries
/// of 8 bytes: interface (2), alternate setting (2), maximum transfer size (4). Little-endian.
namespace ConfigurationBlock {
inline constexpr std::size_t ConfigurationIndex = 0;
inline constexpr std::size_t InterfaceCount = 2;
inline constexpr std::size_t FirstEntry = 4;
inline constexpr std::size_t EntrySize = 8;
inline constexpr std::size_t MaximumEntries = 32;
inline constexpr std::size_t EntryInterface = 0;
inline constexpr std::size_t EntryAlternateSetting = 2;
inline constexpr std::size_t EntryMaximumTransferSize = 4;
inline constexpr std::size_t Size = FirstEntry + MaximumEntries * EntrySize;
static_assert(Size == 260);
}  // namespace ConfigurationBlock

/// Class or vendor request, 18 bytes, little-endian, no padding.
namespace RequestBlock {
inline constexpr std::size_t Flags = 0;          ///< 4 bytes
inline constexpr std::size_t Type = 4;           ///< 4 bytes; 2 vendor
inline constexpr std::size_t Recipient = 8;      ///< 4 bytes; 0 device
inline constexpr std::size_t ReservedBits = 12;  ///< 1 byte: reserved bits of the setup packet's request type
inline constexpr std::size_t Request = 13;       ///< 1 byte
inline constexpr std::size_t Value = 14;         ///< 2 bytes
inline constexpr std::size_t Index = 16;         ///< 2 bytes
inline constexpr std::size_t Size = 18;
inline constexpr std::uint32_t TypeVendor = 2;
}  // namespace RequestBlock

/// Device parameters: two 32-bit words, little-endian.
inline constexpr std::size_t DeviceParametersSize = 8;

inline constexpr std::uint32_t MaximumTransferSize = 65536;

}  // namespace Varnholt::Protocol::UsbIoDriver
