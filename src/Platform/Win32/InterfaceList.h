#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "Platform/DeviceInterfaces.h"
#include "Platform/Win32/SetupApi.h"
#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// What a `DeviceList` stands for. The operations are those of `DeviceInterfaces`.
class InterfaceList {
  public:
    virtual ~InterfaceList() = default;
    virtual bool Find(const Protocol::Guid& interfaceClass, std::uint32_t index, InterfaceRecord& record) = 0;
    virtual std::uint32_t DetailSize(const InterfaceRecord& record) = 0;
    virtual bool ReadDetail(const InterfaceRecord& record, std::span<std::byte> detail) = 0;
};

/// The present interfaces of a class as setupapi lists them; null, with the error code set, on failure.
std::shared_ptr<InterfaceList> MakeSetupApiList(SetupApi& setupApi, const Protocol::Guid& interfaceClass);

/// A list of paths, where setupapi is not asked.
std::shared_ptr<InterfaceList> MakePathList(const Protocol::Guid& interfaceClass,
                                            std::vector<std::string> paths);

}  // namespace Varnholt::Platform
