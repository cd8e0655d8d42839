#include "ImageCheck.h"

#include <optional>
#include <stdexcept>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"
#include "Protocol/EepromMap.h"
#include "Service/Memory/ImageModel.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace EepromMap = Protocol::EepromMap;
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

bool ReadsAs(const Bytes& image, Service::ImageModel& expected) {
    Service::ImageModel read(image);
    return Service::HaveSameBytes(read.Calibration(), expected.Calibration()) &&
           Service::HaveSameBytes(read.Log(), expected.Log());
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
    const PellandoEAT table = Service::TableOf(dumped);
    if (!table.Locates(model->Log(), EepromMap::MainLog, 0) ||
        !table.Locates(model->Calibration(), EepromMap::Calibration, 0)) {
        return false;
    }
    if (!ReadsAs(dumped, *model)) {
        throw std::logic_error("the dump reads differently");
    }
    if (!table.Locates(model->Log(), EepromMap::LogCopy, EepromMap::LogCopyIdOffset)) {
        return false;
    }
    dumped[EepromMap::MainLog] = static_cast<std::uint8_t>(~dumped[EepromMap::MainLog]);
    if (!ReadsAs(dumped, *model)) {
        throw std::logic_error("the dump's second log reads differently");
    }
    return true;
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
