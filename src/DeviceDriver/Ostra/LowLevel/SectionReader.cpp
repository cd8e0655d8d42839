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

namespace {

/// The table came from outside.
bool LiesInTheImage(std::int32_t address, std::int32_t size) {
    constexpr auto end = static_cast<std::int32_t>(Protocol::EepromSize);
    return address >= 0 && address <= end && size >= 0 && size <= end - address;
}

}  // namespace

Properties SectionReader::operator()(const std::uint8_t* image, std::uint16_t idOffset) const try {
    Properties section;
    for (const auto& entry : table_.GetDatastore().GetDatastore()) {
        const std::uint16_t id = entry.first;
        if (!isPicked_(id)) {
            continue;
        }
        const auto tableId = static_cast<std::uint16_t>(id + idOffset);
        const std::int32_t address = table_.AddressOf(tableId);
        const std::int32_t size = table_.SizeOf(tableId);
        if (!LiesInTheImage(address, size)) {
            throw DataException(PellandoEAT::CorruptTable, Here());
        }
        Property value = ConfigurationDataConverter::GetDefaultProperty(id);
        value.Assign(std::span(image + address, static_cast<std::size_t>(size)), true);
        // No identifier occurs twice in a table, so there is nothing to look for in the section.
        section.GetDatastore().emplace_back(id, std::move(value));
    }
    return section;
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
