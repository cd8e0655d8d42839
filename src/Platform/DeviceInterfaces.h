#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// A snapshot of the interfaces of one class, made by `DeviceInterfaces::MakeList`.
using DeviceList = void*;

/// Names one interface of a list. The size field is checked by the platform.
struct InterfaceRecord {
    std::uint32_t size = 28;
    Protocol::Guid interfaceClass{};
    std::uint32_t flags = 0;
    std::uintptr_t reserved = 0;
};

/// Offset of the zero-terminated path in an interface detail, behind its size field; and what that field
/// holds.
inline constexpr std::size_t InterfaceDetailPathOffset = 4;
inline constexpr std::uint32_t InterfaceDetailSizeField = 5;

/// The platform's device-interface enumeration. On Windows this is setupapi, loaded at first use and unloaded
/// at the end of the process; hosts that lack it are answered from the registry where `withRegistryFallback`
/// says so. The paths come from the file system in force (`DeviceFiles`) where a test replaced it. Any
/// thread.
class DeviceInterfaces final {
  public:
    /// Loads what the other operations need; false when it cannot be had. They load it themselves.
    static bool Load();

    /// Null on failure. `withRegistryFallback` lets an NT host before version 5 answer from its registry.
    static DeviceList MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback);
    static bool DestroyList(DeviceList list);

    /// Finds interface `index` of the list; `Errors::NoMoreItems` behind the last.
    static bool Find(DeviceList list, const Protocol::Guid& interfaceClass, std::uint32_t index,
                     InterfaceRecord& record);

    /// Bytes that `ReadDetail` needs for this interface; 0 on failure.
    static std::uint32_t DetailSize(DeviceList list, const InterfaceRecord& record);

    /// Fills `detail` (size field set by the caller to `InterfaceDetailSizeField`) with the zero-terminated
    /// path.
    static bool ReadDetail(DeviceList list, const InterfaceRecord& record, std::span<std::byte> detail);
};

}  // namespace Varnholt::Platform
