#include "Interface/Readout.h"

#include "DeviceDriver/Generic/Utilities/EndianConversion.h"

namespace Varnholt::Interface {

std::array<std::int32_t, Protocol::ReadoutValues> ReadoutFromBytes(
    std::span<const std::uint8_t, Protocol::ReadoutBytes> bytes) {
    constexpr std::size_t last = Protocol::ReadoutValues - 1;
    std::array<std::int32_t, Protocol::ReadoutValues> values{};
    for (std::size_t k = 0; k < last; ++k) {
        std::uint16_t reading = 0;
        DeviceDriver::Generic::Utilities::EndianConversion::ByteArrayToShort(bytes.data() + 2 * k, reading,
                                                                             true);
        values[k] = ReadingOf(reading);
    }
    values[last] = values[last - 1];
    values[0] = values[1];
    return values;
}

}  // namespace Varnholt::Interface
