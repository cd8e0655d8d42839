#include "DeviceDriver/Ostra/LowLevel/PellandoEAT.h"

#include <algorithm>
#include <bitset>
#include <initializer_list>
#include <iterator>
#include <limits>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoLog.h"
#include "Protocol/EepromMap.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace EepromMap = Protocol::EepromMap;
namespace TableLayout = Protocol::EepromMap::TableLayout;
namespace EndianConversion = Generic::Utilities::EndianConversion;
using namespace Generic::Configuration;

namespace {

constexpr std::uint32_t HeaderSize = TableLayout::FirstEntry;

bool IsSectionEnd(std::uint16_t id) {
    return id == EepromMap::EndOfMainLog || id == EepromMap::EndOfCalibration ||
           id == EepromMap::EndOfLogCopy;
}

std::uint16_t WithOffset(std::uint16_t id, std::uint16_t idOffset) {
    return static_cast<std::uint16_t>(id + idOffset);
}

/// The distance between two addresses, which may be any two 32-bit numbers. A refusal is the caller's.
std::int32_t To32Bits(std::int64_t value, const SourceLocation& caller = SourceLocation::current()) {
    if (value < std::numeric_limits<std::int32_t>::min() ||
        value > std::numeric_limits<std::int32_t>::max()) {
        throw DataException(PellandoEAT::CorruptTable, Here(caller));
    }
    return static_cast<std::int32_t>(value);
}

auto Find(const Properties::Datastore& entries, std::uint16_t id) {
    return std::find_if(entries.begin(), entries.end(),
                        [id](const auto& entry) { return entry.first == id; });
}

/// The default value of `id` with every element set to `element`.
Property Filled(std::uint16_t id, std::int32_t element) {
    Property value = ConfigurationDataConverter::GetDefaultProperty(id);
    const auto asFloat = static_cast<float>(element);
    switch (value.GetType()) {
        case TypeLong:
            return value.Assign(element);
        case TypeLongVector:
            return value.Assign(std::vector<std::int32_t>(value.AsLongVector().size(), element));
        case TypeFloat:
            return value.Assign(asFloat);
        case TypeFloatVector:
            return value.Assign(std::vector<float>(value.AsFloatVector().size(), asFloat));
        case TypeNone:
            break;
    }
    return value;
}

Properties MakeDefaultSet(const char* name, std::int32_t element, std::initializer_list<std::uint16_t> ids) {
    Properties set(name);
    for (const std::uint16_t id : ids) {
        set.SetProperty(id, Filled(id, element));
    }
    return set;
}

}  // namespace

PellandoEAT::PellandoEAT(std::vector<std::uint8_t>::const_iterator table) try { ParseBuffer(&*table); }
TRACED

void PellandoEAT::ParseBuffer(const std::uint8_t* buffer) try {
    std::uint16_t newVersion = 0;
    std::uint16_t newLength = 0;
    EndianConversion::ByteArrayToShort(buffer + TableLayout::Version, newVersion, true);
    EndianConversion::ByteArrayToShort(buffer + TableLayout::Length, newLength, true);
    if (newVersion != TableLayout::KnownVersion || newLength < TableLayout::ShortestLength ||
        newLength > TableLayout::LongestLength) {
        throw DataException(CorruptTable, Here());
    }
    version_ = newVersion;
    length_ = newLength;
    std::bitset<std::numeric_limits<std::uint16_t>::max() + 1> seen;
    for (const auto& entry : datastore_.GetDatastore()) {
        seen.set(entry.first);
    }
    for (std::uint32_t offset = HeaderSize;
         offset < length_ && offset + TableLayout::EntrySize <= EepromMap::TableArea;
         offset += TableLayout::EntrySize) {
        std::uint16_t id = 0;
        std::int32_t address = 0;
        EndianConversion::ByteArrayToShort(buffer + offset + TableLayout::EntryIdentifier, id, true);
        EndianConversion::ByteArrayToLong(buffer + offset + TableLayout::EntryAddress, address, true);
        if (seen[id]) {
            datastore_.SetProperty(id, Property(address));
        } else {
            datastore_.GetDatastore().emplace_back(id, Property(address));
            seen.set(id);
        }
    }
}
TRACED

std::int32_t PellandoEAT::AddressOf(std::uint16_t id) const try {
    return datastore_.GetProperty(id).AsLong();
}
TRACED

std::int32_t PellandoEAT::SizeOf(std::uint16_t id) const try {
    const auto& entries = datastore_.GetDatastore();
    const auto entry = Find(entries, id);
    if (entry == entries.end() || std::next(entry) == entries.end()) {
        throw ResourceException("id " + std::to_string(id) + " doesn't exist", Here());
    }
    return To32Bits(std::int64_t{std::next(entry)->second.AsLong()} - entry->second.AsLong());
}
TRACED

bool PellandoEAT::IsEntryInLogArea(std::uint16_t id, std::uint32_t count) const try {
    return std::int64_t{AddressOf(id)} + count < EepromMap::EndOfLogArea;
}
TRACED

void PellandoEAT::EnsureConsistency(const Properties& set) try {
    Backup before;
    try {
        MoveFor(set, 0, before);
    } catch (...) {
        Restore(before);
        throw;
    }
}
TRACED

void PellandoEAT::EnsureConsistency(const PellandoLog& log) try { EnsureConsistency(log.GetItems()); }
TRACED

void PellandoEAT::FitSection(const Properties& set, std::uint16_t idOffset) try {
    Backup before;
    try {
        MoveFor(set, idOffset, before);
        MoveSectionEnd(set, idOffset, before);
    } catch (...) {
        Restore(before);
        throw;
    }
}
TRACED

void PellandoEAT::Restore(Backup& before) {
    if (before) {
        std::swap(datastore_, *before);
    }
}

void PellandoEAT::MoveFor(const Properties& set, std::uint16_t idOffset, Backup& before) {
    const auto& values = set.GetDatastore();
    for (auto value = values.begin(); value != values.end(); ++value) {
        const std::int64_t difference =
            static_cast<std::int64_t>(value->second.SizeOf()) - SizeOf(WithOffset(value->first, idOffset));
        if (difference == 0) {
            continue;
        }
        for (auto later = std::next(value); later != values.end(); ++later) {
            const std::uint16_t id = WithOffset(later->first, idOffset);
            MoveTo(id, AddressOf(id) + difference, before);
        }
    }
}

void PellandoEAT::MoveSectionEnd(const Properties& set, std::uint16_t idOffset, Backup& before) {
    if (set.GetDatastore().empty()) {
        return;
    }
    const auto& [lastId, lastValue] = set.GetDatastore().back();
    const auto& entries = datastore_.GetDatastore();
    const auto last = Find(entries, WithOffset(lastId, idOffset));
    const auto behind = last == entries.end() ? last : std::next(last);
    if (behind != entries.end() && IsSectionEnd(behind->first)) {
        MoveTo(behind->first,
               std::int64_t{last->second.AsLong()} + static_cast<std::int64_t>(lastValue.SizeOf()), before);
    }
}

void PellandoEAT::MoveTo(std::uint16_t id, std::int64_t address, Backup& before) {
    if (!before) {
        before = datastore_;
    }
    datastore_.GetProperty(id).Assign(To32Bits(address));
}

bool PellandoEAT::Locates(const Properties& set, std::uint32_t start, std::uint16_t idOffset) const try {
    std::int64_t expected = start;
    const auto& entries = datastore_.GetDatastore();
    for (const auto& [id, value] : set.GetDatastore()) {
        const auto entry = Find(entries, WithOffset(id, idOffset));
        if (entry == entries.end() || std::next(entry) == entries.end() ||
            entry->second.AsLong() != expected) {
            return false;
        }
        expected += static_cast<std::int64_t>(value.SizeOf());
        if (std::next(entry)->second.AsLong() != expected) {
            return false;
        }
    }
    return true;
}
TRACED

void PellandoEAT::Dump(std::vector<std::uint8_t>::iterator first,
                       std::vector<std::uint8_t>::iterator last) const try {
    if (static_cast<std::size_t>(last - first) < HeaderSize) {
        throw ResourceException("Configuration data dump target too small", Here());
    }
    EndianConversion::ShortToByteArray(version_, &*first + TableLayout::Version, true);
    EndianConversion::ShortToByteArray(length_, &*first + TableLayout::Length, true);
    datastore_.Dump(first + HeaderSize, last, false, true);
}
TRACED

void PellandoEAT::InitializeEmtpyEAT() try {
    CreateSection(GetDefaultLogData(), EepromMap::MainLog, EepromMap::EndOfMainLog, 0);
    CreateSection(GetDefaultLogData(), EepromMap::LogCopy, EepromMap::EndOfLogCopy,
                  EepromMap::LogCopyIdOffset);
    CreateSection(GetDefaultCalibrationData(), EepromMap::Calibration, EepromMap::EndOfCalibration, 0);
    version_ = TableLayout::KnownVersion;
    length_ = static_cast<std::uint16_t>(datastore_.SizeOf(false) + HeaderSize);
}
TRACED

void PellandoEAT::CreateSection(const Properties& defaults, std::uint32_t start, std::uint16_t sectionId,
                                std::uint32_t idOffset) try {
    std::uint32_t address = start;
    for (const auto& [id, value] : defaults.GetDatastore()) {
        datastore_.SetProperty(static_cast<std::uint16_t>(id + idOffset),
                               Property(static_cast<std::int32_t>(address)));
        address += static_cast<std::uint32_t>(value.SizeOf());
    }
    datastore_.SetProperty(sectionId, Property(static_cast<std::int32_t>(address)));
}
TRACED

const Properties& PellandoEAT::GetDefaultCalibrationData() try {
    static const Properties calibrationData =
        MakeDefaultSet("CalibrationData", -1,
                       {1000, 1001, 1002, 1003, 1004, 3001, 1100, 1101, 3002, 1102, 1221, 1222, 1204, 1205,
                        1207, 1208, 1213, 1211, 4000, 1212, 3007, 3014, 3008, 3009, 3010, 3011, 3012, 3013});
    return calibrationData;
}
TRACED

const Properties& PellandoEAT::GetDefaultLogData() try {
    static const Properties logData = MakeDefaultSet(
        "LogData", 0, {10000, 10001, 10002, 10003, 10004, 10005, 10010, 10011, 10012, 10013, 10020, 10021});
    return logData;
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
