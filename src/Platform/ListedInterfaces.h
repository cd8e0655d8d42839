#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "Platform/DeviceInterfaces.h"
#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// Answers the questions of `DeviceInterfaces` from a list of paths: where the platform has no enumeration of
/// its own, and where a test replaced the device files. The operations fail as those of `DeviceInterfaces`
/// do.
class ListedInterfaces final {
  public:
    ListedInterfaces(const Protocol::Guid& interfaceClass, std::vector<std::string> paths);

    bool Find(const Protocol::Guid& interfaceClass, std::uint32_t index, InterfaceRecord& record) const;
    std::uint32_t DetailSize(const InterfaceRecord& record) const;
    bool ReadDetail(const InterfaceRecord& record, std::span<std::byte> detail) const;

  private:
    /// The path that a record of this list names; null, with the error code set, for any other record.
    const std::string* PathOf(const InterfaceRecord& record) const;

    const Protocol::Guid listedClass_;
    const std::vector<std::string> listedPaths_;
};

}  // namespace Varnholt::Platform
