#include "Service/Memory/ImageTransport.h"

#include <algorithm>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Service {

using DeviceDriver::Generic::Utilities::IOException;
using Utilities::Exceptions::Here;

std::uint8_t* ImageTransport::Place(const Bytes4& address, std::uint32_t count) const {
    const std::size_t first = Protocol::LoadBig32(address.data());
    if (first > image_.size() || count > image_.size() - first) {
        throw IOException("access beyond the end of the EEPROM", Here());
    }
    return image_.data() + first;
}

void ImageTransport::WriteEEPROM(const Bytes4& address, const Bytes2&, const std::uint8_t* data,
                                 std::uint32_t count) {
    std::copy_n(data, count, Place(address, count));
}

void ImageTransport::ReadEEPROM(const Bytes4& address, const Bytes2&, std::uint8_t* data,
                                std::uint32_t count) {
    std::copy_n(Place(address, count), count, data);
}

void ImageTransport::Refuse() {
    throw IOException("an image file knows no other commands than those of its EEPROM", Here());
}

}  // namespace Varnholt::Service
