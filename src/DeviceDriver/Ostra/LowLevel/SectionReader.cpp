#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"

#include <span>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "Protocol/Instrument.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using Generic::Configuration::Properties;
using Generic::Configuration::Property;
using Generic::Utilities::DataException;
using Varnholt::Utilities::Exceptions::Here;

namespace {

/// The image's bytes of one value, or `DataException`: the table came from outside.
std::span<const std::uint8_t> BytesOf(const std::uint8_t* image, std::int32_t address, std::int32_t size) {
    constexpr auto end = static_cast<std::int32_t>(Protocol::EepromSize);
    if (address < 0 || address > end || size < 0 || size > end - address ||
        size % static_cast<std::int32_t>(Property::ElementSize) != 0) {
        throw DataException(PellandoEAT::CorruptTable, Here());
    }
    return {image + address, static_cast<std::size_t>(size)};
}

}  // namespace

Properties SectionReader::operator()(const std::uint8_t* image, std::uint16_t idOffset) const try {
    Properties section;
    for (const auto& entry : table.GetDatastore().GetDatastore()) {
        const std::uint16_t id = entry.first;
        if (!isPicked(id)) {
            continue;
        }
        const auto tableId = static_cast<std::uint16_t>(id + idOffset);
        const auto bytes = BytesOf(image, table.AddressOf(tableId), table.SizeOf(tableId));
        Property value = ConfigurationDataConverter::GetDefaultProperty(id);
        value.Assign(bytes, true);
        // No identifier occurs twice in a table, so there is nothing to look for in the section.
        section.GetDatastore().emplace_back(id, std::move(value));
    }
    return section;
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
