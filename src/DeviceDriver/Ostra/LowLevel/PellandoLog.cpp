#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"

#include <bit>

#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "Protocol/EepromMap.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using namespace Generic::Configuration;
using Protocol::PropertyIds::LogChecksum;

namespace {

constexpr std::int32_t ChangesBeforeDump = 20;

}  // namespace

PellandoLog::PellandoLog(const PellandoEAT& table, std::vector<std::uint8_t>::const_iterator image) try
    : items_("MainLogData") {
    ParseBuffer(table, &*image, 0);
    if (!HasValidChecksum()) {
        RestoreLogData(table, &*image);
    }
    RefillPendingItems();
}
TRACED

void PellandoLog::ParseBuffer(const PellandoEAT& table, const std::uint8_t* image,
                              std::uint16_t idOffset) try {
    const SectionReader readSection(table, &ConfigurationDataConverter::IsLogParameter);
    items_ = readSection(image, idOffset);
}
TRACED

void PellandoLog::RestoreLogData(const PellandoEAT& table, const std::uint8_t* image) try {
    ParseBuffer(table, image, Protocol::EepromMap::LogCopyIdOffset);
    if (HasValidChecksum()) {
        return;
    }
    for (auto& [id, value] : items_.GetDatastore()) {
        value = ConfigurationDataConverter::GetDefaultProperty(id);
    }
}
TRACED

std::uint32_t PellandoLog::CalculateChecksum() const try {
    std::uint32_t sum = 0;
    for (const auto& [id, value] : items_.GetDatastore()) {
        if (id == LogChecksum) {
            continue;
        }
        // Only the vector that the type names holds anything.
        for (const std::int32_t element : value.AsLongVector()) {
            sum += static_cast<std::uint32_t>(element);
        }
        for (const float& element : value.AsFloatVector()) {  // a copy may change the pattern
            sum += std::bit_cast<std::uint32_t>(element);
        }
    }
    return sum;
}
TRACED

bool PellandoLog::HasValidChecksum() const try {
    const Property& stored = items_.GetProperty(LogChecksum);
    return !stored.AsLongVector().empty() &&
           static_cast<std::uint32_t>(stored.AsLong()) == CalculateChecksum();
}
TRACED

void PellandoLog::UpdateChecksum() try {
    items_.GetProperty(LogChecksum).Assign(static_cast<std::int32_t>(CalculateChecksum()));
}
TRACED

const Property& PellandoLog::GetItem(std::uint16_t id) const try { return items_.GetProperty(id); }
TRACED

void PellandoLog::SetItem(std::uint16_t id, const Property& value) try {
    pendingItems_.remove(id);
    items_.SetProperty(id, value);
    if (pendingItems_.empty()) {
        changeCount_ = ChangesBeforeDump;
        RefillPendingItems();
    }
    ++changeCount_;
}
TRACED

void PellandoLog::Increment(std::uint16_t id, std::int32_t step) try {
    const auto sum = static_cast<std::uint32_t>(GetItem(id).AsLong()) + static_cast<std::uint32_t>(step);
    SetItem(id, Property(static_cast<std::int32_t>(sum)));
}
TRACED

void PellandoLog::Increment(std::uint16_t id, float step) try {
    SetItem(id, Property(GetItem(id).AsFloat() + step));
}
TRACED

bool PellandoLog::IsDumpRecommended() const {
    return changeCount_ >= ChangesBeforeDump;
}

std::size_t PellandoLog::SizeOf() const {
    return items_.SizeOf(true);
}

void PellandoLog::Dump(std::vector<std::uint8_t>::iterator first,
                       std::vector<std::uint8_t>::iterator last) try {
    changeCount_ = 0;
    UpdateChecksum();
    items_.Dump(first, last, true, true);
}
TRACED

void PellandoLog::RefillPendingItems() {
    pendingItems_ = {10010, 10011, 10012, 10013, 10020, 10021};
}

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
