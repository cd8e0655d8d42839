#include "UsbIo/UsbIoRecords.h"

#include <algorithm>

#include "Protocol/ByteOrder.h"

namespace Varnholt::UsbIo {

using namespace Protocol;
namespace ConfigurationBlock = UsbIoDriver::ConfigurationBlock;
namespace RequestBlock = UsbIoDriver::RequestBlock;

DriverInfo DriverInfo::Decode(const Bytes& bytes) {
    return {LoadLittle16(bytes.data())};
}

Configuration::Bytes Configuration::Encode() const {
    const std::size_t count = std::min(interfaces.size(), ConfigurationBlock::MaximumEntries);
    Bytes bytes{};
    StoreLittle16(&bytes[ConfigurationBlock::ConfigurationIndex], index);
    StoreLittle16(&bytes[ConfigurationBlock::InterfaceCount], static_cast<std::uint16_t>(count));
    for (std::size_t i = 0; i < count; ++i) {
        std::uint8_t* const entry =
            &bytes[ConfigurationBlock::FirstEntry + i * ConfigurationBlock::EntrySize];
        StoreLittle16(entry + ConfigurationBlock::EntryInterface, interfaces[i].interfaceIndex);
        StoreLittle16(entry + ConfigurationBlock::EntryAlternateSetting, interfaces[i].alternateSetting);
        StoreLittle32(entry + ConfigurationBlock::EntryMaximumTransferSize,
                      interfaces[i].maximumTransferSize);
    }
    return bytes;
}

ClassOrVendorRequest::Bytes ClassOrVendorRequest::Encode() const {
    Bytes bytes{};
    StoreLittle32(&bytes[RequestBlock::Flags], flags);
    StoreLittle32(&bytes[RequestBlock::Type], type);
    StoreLittle32(&bytes[RequestBlock::Recipient], recipient);
    bytes[RequestBlock::ReservedBits] = reservedBits;
    bytes[RequestBlock::Request] = request;
    StoreLittle16(&bytes[RequestBlock::Value], value);
    StoreLittle16(&bytes[RequestBlock::Index], index);
    return bytes;
}

DeviceParameters DeviceParameters::Decode(const Bytes& bytes) {
    return {{LoadLittle32(bytes.data()), LoadLittle32(bytes.data() + sizeof(std::uint32_t))}};
}

DeviceParameters::Bytes DeviceParameters::Encode() const {
    Bytes bytes{};
    StoreLittle32(bytes.data(), words[0]);
    StoreLittle32(bytes.data() + sizeof(std::uint32_t), words[1]);
    return bytes;
}

}  // namespace Varnholt::UsbIo
