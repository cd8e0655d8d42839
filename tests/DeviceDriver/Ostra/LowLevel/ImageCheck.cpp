#include "ImageCheck.h"

#include <optional>
#include <stdexcept>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace EepromMap = Protocol::EepromMap;
using Generic::Configuration::Properties;
using Generic::Configuration::Property;
using Generic::Utilities::DataException;
using Varnholt::Utilities::Exceptions::ResourceException;

namespace {

using Bytes = std::vector<std::uint8_t>;

bool IsDocumented(const std::exception& exception) {
    const std::string text = exception.what();
    if (dynamic_cast<const DataException*>(&exception)) {
        return text == PellandoEAT::CorruptTable;
    }
    return dynamic_cast<const ResourceException*>(&exception) &&
           ((text.starts_with("id ") && text.ends_with(" doesn't exist")) ||
            text == "Configuration data dump target too small");
}

Bytes BytesOf(PellandoEEPROM& eeprom, const char* section) {
    Properties set(section);
    eeprom.Load(set);
    Bytes bytes(set.SizeOf(false));
    set.Dump(bytes.begin(), bytes.end(), false, true);
    return bytes;
}

using Values = std::pair<Bytes, Bytes>;  // of calibration and log

Values ValuesOf(PellandoEEPROM& eeprom) {
    return {BytesOf(eeprom, "CalibrationData"), BytesOf(eeprom, "LogData")};
}

Values ValuesIn(const Bytes& image) {
    return ValuesOf(Service::ImageModel(image).Get());
}

/// Whether the image's table finds the model's values of a section from `start` on.
bool Locates(const Bytes& image, PellandoEEPROM& eeprom, const char* section, std::uint32_t start,
             std::uint16_t idOffset = 0) {
    Properties values(section);
    return PellandoEAT(image.begin() + EepromMap::Table).Locates(eeprom.Load(values), start, idOffset);
}

Property Resized(Property value, std::uint16_t elements) {
    value.Assign(Bytes(Property::ElementSize * elements, 0x41), true);
    return value;
}

}  // namespace

bool RoundTrips(const Bytes& image, const std::vector<Resize>& resizes) {
    std::optional<Service::ImageModel> model;
    Bytes dumped;
    try {
        model.emplace(image);
        for (const auto& [id, elements] : resizes) {
            model->Get().SetProperty(id, Resized(model->Get().GetProperty(id), elements));
        }
        dumped = model->Get().Dump();
    } catch (const std::exception& exception) {
        if (IsDocumented(exception)) {
            return false;
        }
        throw;
    }
    PellandoEEPROM& eeprom = model->Get();
    if (!Locates(dumped, eeprom, "LogData", EepromMap::MainLog) ||
        !Locates(dumped, eeprom, "CalibrationData", EepromMap::Calibration)) {
        return false;
    }
    const Values expected = ValuesOf(eeprom);  // behind the dump, which renews the checksum
    if (ValuesIn(dumped) != expected) {
        throw std::logic_error("the dump reads differently");
    }
    if (!Locates(dumped, eeprom, "LogData", EepromMap::LogCopy, EepromMap::LogCopyIdOffset)) {
        return false;
    }
    dumped[EepromMap::MainLog] = static_cast<std::uint8_t>(~dumped[EepromMap::MainLog]);
    if (ValuesIn(dumped) != expected) {
        throw std::logic_error("the dump's second log reads differently");
    }
    return true;
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
