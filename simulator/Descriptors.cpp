#include "Descriptors.h"

#include <string_view>

#include "Protocol/ByteOrder.h"

namespace Varnholt::Simulator {
namespace {

enum Type : std::uint8_t {
    DeviceType = 1,
    ConfigurationType = 2,
    StringType = 3,
    InterfaceType = 4,
    EndpointType = 5,
};

enum Text : std::uint8_t { Languages = 0, Manufacturer = 1, Product = 2, Serial = 3 };
constexpr std::uint16_t EnglishUnitedStates = 0x0409;

using Bytes = std::vector<std::uint8_t>;

constexpr std::uint8_t Low(std::uint16_t word) {
    return static_cast<std::uint8_t>(word);
}
constexpr std::uint8_t High(std::uint16_t word) {
    return static_cast<std::uint8_t>(word >> 8);
}

/// A descriptor with its length in front.
Bytes WithLength(Type type, const Bytes& content) {
    Bytes descriptor{static_cast<std::uint8_t>(content.size() + 2), type};
    descriptor.insert(descriptor.end(), content.begin(), content.end());
    return descriptor;
}

Bytes DeviceDescriptor() {
    constexpr std::uint16_t usbVersion = 0x0200;
    constexpr std::uint8_t controlPacketSize = 64;
    constexpr std::uint8_t configurations = 1;
    return WithLength(
        DeviceType, {Low(usbVersion), High(usbVersion), VendorClass, 0, 0, controlPacketSize, Low(VendorId),
                     High(VendorId), Low(ProductId), High(ProductId), Low(DeviceVersion), High(DeviceVersion),
                     Manufacturer, Product, Serial, configurations});
}

Bytes ConfigurationDescriptor() {
    constexpr std::uint8_t selfPowered = 0xC0;
    constexpr std::uint8_t halfOfMilliamperes = 50;
    constexpr std::uint8_t interruptInterval = 4;
    Bytes bytes =
        WithLength(ConfigurationType, {0, 0, 1, ConfigurationValue, 0, selfPowered, halfOfMilliamperes});
    const auto append = [&bytes](const Bytes& descriptor) {
        bytes.insert(bytes.end(), descriptor.begin(), descriptor.end());
    };
    append(WithLength(InterfaceType, {0, 0, Endpoints.size(), VendorClass, 0, 0, 0}));
    for (const auto& endpoint : Endpoints) {
        const bool isInterrupt = endpoint.address == Protocol::InterruptInEndpoint;
        append(WithLength(EndpointType, {endpoint.address, endpoint.attributes,
                                         Low(endpoint.maximumPacketSize), High(endpoint.maximumPacketSize),
                                         isInterrupt ? interruptInterval : std::uint8_t{0}}));
    }
    constexpr std::size_t totalLength = 2;
    Protocol::StoreLittle16(&bytes[totalLength], static_cast<std::uint16_t>(bytes.size()));
    return bytes;
}

Bytes StringDescriptor(std::string_view text) {
    constexpr std::size_t longest = 126;
    Bytes letters;
    for (const char letter : text.substr(0, longest)) {
        letters.insert(letters.end(), {static_cast<std::uint8_t>(letter), 0});
    }
    return WithLength(StringType, letters);
}

}  // namespace

std::vector<std::uint8_t> Descriptor(std::uint16_t typeAndIndex, const std::string& serial) {
    const auto index = static_cast<std::uint8_t>(typeAndIndex);
    switch (typeAndIndex >> 8) {
        case DeviceType:
            return DeviceDescriptor();
        case ConfigurationType:
            return index == 0 ? ConfigurationDescriptor() : std::vector<std::uint8_t>();
        case StringType:
            break;
        default:
            return {};
    }
    switch (index) {
        case Languages:
            return WithLength(StringType, {Low(EnglishUnitedStates), High(EnglishUnitedStates)});
        case Manufacturer:
            return StringDescriptor("Varnholt");
        case Product:
            return StringDescriptor("Ostra, simulated");
        case Serial:
            return StringDescriptor(serial);
        default:
            return {};
    }
}

}  // namespace Varnholt::Simulator
