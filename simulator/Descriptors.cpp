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

class DescriptorWriter final {
  public:
    explicit DescriptorWriter(Type type) { Begin(type); }

    DescriptorWriter& Begin(Type type) {
        EndCurrent();
        start_ = bytes_.size();
        return Byte(0).Byte(type);
    }
    DescriptorWriter& Byte(std::uint8_t value) {
        bytes_.push_back(value);
        return *this;
    }
    DescriptorWriter& Word(std::uint16_t value) {
        return Byte(static_cast<std::uint8_t>(value)).Byte(static_cast<std::uint8_t>(value >> 8));
    }
    std::vector<std::uint8_t> Finish() {
        EndCurrent();
        return bytes_;
    }

  private:
    void EndCurrent() {
        if (!bytes_.empty()) {
            bytes_[start_] = static_cast<std::uint8_t>(bytes_.size() - start_);
        }
    }

    std::vector<std::uint8_t> bytes_;
    std::size_t start_ = 0;
};

std::vector<std::uint8_t> DeviceDescriptor() {
    constexpr std::uint16_t usbVersion = 0x0200;
    constexpr std::uint8_t controlPacketSize = 64;
    return DescriptorWriter(DeviceType)
        .Word(usbVersion)
        .Byte(VendorClass)
        .Byte(0)
        .Byte(0)
        .Byte(controlPacketSize)
        .Word(VendorId)
        .Word(ProductId)
        .Word(DeviceVersion)
        .Byte(Manufacturer)
        .Byte(Product)
        .Byte(Serial)
        .Byte(1)
        .Finish();
}

std::vector<std::uint8_t> ConfigurationDescriptor() {
    constexpr std::uint8_t selfPowered = 0xC0;
    constexpr std::uint8_t halfOfMilliamperes = 50;
    constexpr std::uint8_t interruptInterval = 4;
    DescriptorWriter writer(ConfigurationType);
    writer.Word(0).Byte(1).Byte(ConfigurationValue).Byte(0).Byte(selfPowered).Byte(halfOfMilliamperes);
    writer.Begin(InterfaceType)
        .Byte(0)
        .Byte(0)
        .Byte(Endpoints.size())
        .Byte(VendorClass)
        .Byte(0)
        .Byte(0)
        .Byte(0);
    for (const auto& endpoint : Endpoints) {
        writer.Begin(EndpointType)
            .Byte(endpoint.address)
            .Byte(endpoint.attributes)
            .Word(endpoint.maximumPacketSize)
            .Byte(endpoint.address == Protocol::InterruptInEndpoint ? interruptInterval : 0);
    }
    std::vector<std::uint8_t> bytes = writer.Finish();
    constexpr std::size_t totalLength = 2;
    Protocol::StoreLittle16(&bytes[totalLength], static_cast<std::uint16_t>(bytes.size()));
    return bytes;
}

std::vector<std::uint8_t> StringDescriptor(std::string_view text) {
    constexpr std::size_t longest = 126;
    DescriptorWriter writer(StringType);
    for (const char letter : text.substr(0, longest)) {
        writer.Word(static_cast<std::uint8_t>(letter));
    }
    return writer.Finish();
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
            switch (index) {
                case Languages:
                    return DescriptorWriter(StringType).Word(EnglishUnitedStates).Finish();
                case Manufacturer:
                    return StringDescriptor("Varnholt");
                case Product:
                    return StringDescriptor("Ostra, simulated");
                case Serial:
                    return StringDescriptor(serial);
                default:
                    return {};
            }
        default:
            return {};
    }
}

}  // namespace Varnholt::Simulator
