#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "Platform/ErrorCodes.h"
#include "Protocol/Guid.h"

namespace Varnholt::Platform {

/// A snapshot of the interfaces of one class that are present.
struct InterfaceList {
    struct Entry {
        ErrorCode code = Errors::Success;  ///< why the platform does not say the path
        std::string path;
    };
    explicit InterfaceList(const Protocol::Guid& listedClass, const std::vector<std::string>& paths = {})
        : interfaceClass(listedClass) {
        for (const std::string& path : paths) {
            entries.push_back({Errors::Success, path});
        }
    }

    const Protocol::Guid interfaceClass;
    std::vector<Entry> entries;
};

/// Null where no list could be made.
using DeviceList = std::shared_ptr<const InterfaceList>;

/// The platform's device-interface enumeration. On Windows this is setupapi, loaded at first use and unloaded
/// at the end of the process; hosts that lack it are answered from the registry where `withRegistryFallback`
/// says so. Elsewhere the file system in force (`DeviceFiles`) lists paths. Any thread.
class DeviceInterfaces final {
  public:
    /// Loads what the other operations need; false when it cannot be had. They load it themselves.
    static bool Load();

    /// Null on failure, with the code in `LastError`. `withRegistryFallback` lets an NT host before version 5
    /// answer from its registry.
    static DeviceList MakeList(const Protocol::Guid& interfaceClass, bool withRegistryFallback);

    /// Finds the path of interface `index` of the list. `Errors::NoMoreItems` behind the last and for another
    /// class than the list's, `Errors::NoInterfaceDetail` where the platform has no path for it, else
    /// the platform's code.
    static ErrorCode ReadPath(const DeviceList& list, const Protocol::Guid& interfaceClass,
                              std::uint32_t index, std::string& path);
};

}  // namespace Varnholt::Platform
