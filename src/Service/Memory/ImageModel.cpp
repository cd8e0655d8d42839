#include "Service/Memory/ImageModel.h"

#include <algorithm>
#include <utility>

#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "Protocol/EepromMap.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Service/Memory/ImageTransport.h"

namespace Varnholt::Service {
namespace {

using namespace DeviceDriver::Ostra::LowLevel;
using DeviceDriver::Generic::Configuration::Properties;
using Utilities::Tools::SmartPointer;
namespace EepromMap = Protocol::EepromMap;
namespace Ids = Protocol::PropertyIds;

constexpr std::uint8_t UnusedByte = 0xFF;

LogCopy ReadCopy(const PellandoEAT& table, const EepromImage& image, std::uint16_t idOffset) {
    LogCopy copy;
    try {
        PellandoLog log(table, image.begin());
        log.ParseBuffer(table, image.data(), idOffset);
        copy.isValid = log.HasValidChecksum();
        copy.stored = static_cast<std::uint32_t>(log.GetItem(Ids::LogChecksum).AsLong());
        copy.calculated = log.CalculateChecksum();
        copy.items = log.GetItems();
        copy.isReadable = true;
    } catch (const Utilities::Exceptions::RuntimeException&) {
        copy.isValid = false;  // the table does not hold it
    }
    return copy;
}

}  // namespace

ImageModel::ImageModel(EepromImage image) : contents_(std::move(image)) {
    const SmartPointer<PellandoFunctionalityByte> transport(new ImageTransport(contents_));
    const SmartPointer<PellandoFunctionality> commands(new PellandoFunctionality(transport));
    memory_ = std::make_unique<PellandoEEPROM>(commands);
}

Properties ImageModel::LoadSet(const char* name) {
    Properties set(name);
    return memory_->Load(set);
}

bool HaveSameBytes(const Properties& a, const Properties& b) {
    return std::ranges::equal(a.GetDatastore(), b.GetDatastore(), [](const auto& one, const auto& other) {
        return one.first == other.first && one.second.AsByteVector(true) == other.second.AsByteVector(true);
    });
}

PellandoEAT TableOf(const EepromImage& image) {
    return PellandoEAT(image.begin() + EepromMap::Table);
}

LogPlaces PlacesOf(const PellandoEAT& table, const Properties& items) {
    const bool hasSecond = std::ranges::all_of(items.GetDatastore(), [&table](const auto& item) {
        return table.GetDatastore().Contains(
            static_cast<std::uint16_t>(item.first + EepromMap::LogCopyIdOffset));
    });
    return {table.Locates(items, EepromMap::MainLog, 0),
            !hasSecond || table.Locates(items, EepromMap::LogCopy, EepromMap::LogCopyIdOffset)};
}

const char* LogCopies::Used() const {
    return main.isValid ? "main copy" : second.isValid ? "second copy" : "an empty log";
}

LogCopies ReadLogCopies(const EepromImage& image) {
    const PellandoEAT table = TableOf(image);
    return {ReadCopy(table, image, 0), ReadCopy(table, image, EepromMap::LogCopyIdOffset)};
}

EepromImage FreshImage() {
    EepromImage image(Protocol::EepromSize, UnusedByte);
    const auto at = [&image](std::uint32_t address) {
        return image.begin() + static_cast<std::ptrdiff_t>(address);
    };
    PellandoEAT table;
    table.InitializeEmtpyEAT();
    table.Dump(at(EepromMap::Table), at(EepromMap::Calibration));
    const Properties& log = PellandoEAT::GetDefaultLogData();
    log.Dump(at(EepromMap::MainLog), at(EepromMap::LogCopy), true, true);
    log.Dump(at(EepromMap::LogCopy), at(EepromMap::EndOfLogArea), true, true);
    PellandoEAT::GetDefaultCalibrationData().Dump(at(EepromMap::Calibration), image.end(), true, true);
    return image;
}

}  // namespace Varnholt::Service
