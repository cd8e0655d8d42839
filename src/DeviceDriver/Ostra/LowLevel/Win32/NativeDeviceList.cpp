#include "DeviceDriver/Ostra/LowLevel/Win32/NativeDeviceList.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <vector>

#include "Platform/ErrorCodes.h"
#include "Protocol/NativeDriver.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Platform::DeviceInterfaces;

NativeDeviceList::NativeDeviceList()
    : list_(DeviceInterfaces::MakeList(Protocol::NativeDriver::InterfaceClass, true)) {}

NativeDeviceList::~NativeDeviceList() {
    if (list_) {
        DeviceInterfaces::DestroyList(list_);
    }
}

std::string NativeDeviceList::PathAt(std::uint32_t index) const {
    if (!list_) {
        return {};
    }
    for (std::uint32_t member = 0; member <= index; ++member) {
        Platform::InterfaceRecord record;
        if (DeviceInterfaces::Find(list_, Protocol::NativeDriver::InterfaceClass, member, record)) {
            if (member == index) {
                return ReadPath(record);
            }
        } else if (Platform::LastError() == Platform::Errors::NoMoreItems) {
            break;
        }
    }
    return {};
}

std::string NativeDeviceList::ReadPath(const Platform::InterfaceRecord& record) const {
    const std::size_t size = DeviceInterfaces::DetailSize(list_, record);
    if (size <= Platform::InterfaceDetailPathOffset) {
        return {};
    }
    std::vector<std::byte> detail(size);
    std::memcpy(detail.data(), &Platform::InterfaceDetailSizeField,
                sizeof Platform::InterfaceDetailSizeField);
    if (!DeviceInterfaces::ReadDetail(list_, record, detail)) {
        return {};
    }
    const auto path = detail.begin() + Platform::InterfaceDetailPathOffset;
    const auto end = std::find(path, detail.end(), std::byte{0});
    std::string text(static_cast<std::size_t>(end - path), '\0');
    std::memcpy(text.data(), &*path, text.size());
    return text;
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
