#include "Platform/Usb/UsbDescriptors.h"

#include "Protocol/ByteOrder.h"

namespace Varnholt::Platform::Usb {
namespace {

constexpr std::uint8_t InterfaceType = 4;
constexpr std::size_t InterfaceNumber = 2;
constexpr std::size_t InterfaceAlternate = 3;
constexpr std::size_t ShortestInterface = 4;

constexpr std::uint8_t EndpointType = 5;
constexpr std::size_t EndpointAddress = 2;
constexpr std::size_t EndpointAttributes = 3;
constexpr std::size_t EndpointPacketSize = 4;
constexpr std::size_t ShortestEndpoint = 6;

constexpr std::size_t HeaderSize = 2;  // length and type

}  // namespace

std::vector<EndpointInfo> EndpointsOfFirstInterface(std::span<const std::uint8_t> rest) {
    std::vector<EndpointInfo> endpoints;
    bool inFirstInterface = false;
    while (rest.size() >= HeaderSize && rest[0] >= HeaderSize && rest[0] <= rest.size()) {
        const auto descriptor = rest.first(rest[0]);
        const std::uint8_t type = descriptor[1];
        if (type == InterfaceType && descriptor.size() >= ShortestInterface) {
            inFirstInterface = descriptor[InterfaceNumber] == 0 && descriptor[InterfaceAlternate] == 0;
        } else if (type == EndpointType && descriptor.size() >= ShortestEndpoint && inFirstInterface) {
            endpoints.push_back({descriptor[EndpointAddress], descriptor[EndpointAttributes],
                                 Protocol::LoadLittle16(&descriptor[EndpointPacketSize])});
        }
        rest = rest.subspan(descriptor.size());
    }
    return endpoints;
}

}  // namespace Varnholt::Platform::Usb
