#include "DeviceDriver/Ostra/LowLevel/PellandoEEPROM.h"

#include <algorithm>
#include <cstddef>
#include <string>
#include <utility>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "DeviceDriver/Ostra/LowLevel/SectionReader.h"
#include "Protocol/EepromMap.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

namespace EepromMap = Protocol::EepromMap;
namespace PropertyIds = Protocol::PropertyIds;
using namespace Generic::Configuration;
using Varnholt::Utilities::Tools::SmartPointer;
using Bytes = std::vector<std::uint8_t>;

namespace {

constexpr const char* AccessDenied = "EEPROM access denied";
constexpr const char* CalibrationName = "CalibrationData";
constexpr std::uint32_t HalfSize = Protocol::EepromSize / 2;
constexpr std::uint8_t UnreadByte = 0xAA;
constexpr std::uint8_t UnusedByte = 0xFF;

// What the two parts of the binary block must never reach.
static_assert(EepromMap::BinaryFirst + EepromMap::BinaryFirstSize < EepromMap::EndOfLogArea);
static_assert(EepromMap::BinarySecond + EepromMap::BinarySecondSize < EepromMap::EndOfLogArea);

bool IsRawWord(std::uint16_t id) {
    return id >= PropertyIds::FirstRawWord && id <= PropertyIds::LastRawWord;
}

std::uint32_t AddressOfRawWord(std::uint16_t id) {
    return EepromMap::RawWords + (std::uint32_t{id} - PropertyIds::FirstRawWord) * EepromMap::RawWordSize;
}

Bytes Read(PellandoFunctionality& functionality, std::uint32_t address, std::uint32_t size) {
    Bytes bytes(size, UnreadByte);
    functionality.ReadEEPROM(address, bytes);
    return bytes;
}

Bytes Joined(Bytes first, const Bytes& second) {
    first.insert(first.end(), second.begin(), second.end());
    return first;
}

/// The main copy does without the second: where the table lacks it, or holds nonsense of it, it stays so.
void FitSecondLog(PellandoEAT& table, const Properties& items) {
    try {
        table.FitSection(items, EepromMap::LogCopyIdOffset);
    } catch (const RuntimeException&) {
    }
}

bool IsRequested(const Properties& set, std::uint16_t request) {
    return set.Contains(request) && set.GetProperty(request).AsLong() == 1;
}

}  // namespace

PellandoEEPROM::PellandoEEPROM(const SmartPointer<PellandoFunctionality>& instrument) try
    : functionality_(instrument) {
    Bytes first = Read(*functionality_, 0, HalfSize);
    const Bytes second = Read(*functionality_, HalfSize, HalfSize);
    const Bytes image = Joined(std::move(first), second);
    eat_ = SmartPointer<PellandoEAT>(new PellandoEAT(image.begin() + EepromMap::Table));
    log_ = SmartPointer<PellandoLog>(new PellandoLog(*eat_, image.begin()));
    logArea_ = std::clamp<std::size_t>(log_->SizeOf(), EepromMap::LogSize, EepromMap::LogArea);
    SetupCalibrationData(image);
}
TRACED

PellandoEEPROM::~PellandoEEPROM() {
    try {
        DumpLog();
    } catch (...) {  // nobody is left to tell
    }
}

void PellandoEEPROM::SetupCalibrationData(const Bytes& image) try {
    const SectionReader readSection(*eat_, &ConfigurationDataConverter::IsCalibrationParameter);
    calibration_ = readSection(image.data(), 0);
    calibration_.SetName(CalibrationName);
}
TRACED

bool PellandoEEPROM::IsEEPROMProperty(std::uint16_t id) {
    return ConfigurationDataConverter::IsLogParameter(id) ||
           ConfigurationDataConverter::IsCalibrationParameter(id) || id == PropertyIds::WriteThroughRequest ||
           id == PropertyIds::DumpLogRequest;
}

PellandoLog& PellandoEEPROM::GetLog() try { return *log_; }
TRACED

PellandoLog& PellandoEEPROM::GetLog(bool dumpIfRecommended) try {
    if (dumpIfRecommended && log_->IsDumpRecommended()) {
        DumpLog();
    }
    return *log_;
}
TRACED

const Property& PellandoEEPROM::Load(std::uint16_t id) try { return GetProperty(id); }
TRACED

Properties& PellandoEEPROM::Load(Properties& set) try {
    if (set.GetItemCount() == 0) {
        if (set.GetName() == CalibrationName) {
            set = calibration_;
        } else if (set.GetName() == "LogData") {
            set = GetLog().GetItems();
        } else if (set.GetName() == "EATData") {
            set = eat_->GetDatastore();
        }
        return set;
    }
    for (auto& [id, value] : set.GetDatastore()) {
        if (IsEEPROMProperty(id)) {
            value = GetProperty(id);
        }
    }
    return set;
}
TRACED

void PellandoEEPROM::Store(Properties& set) try {
    if (std::ranges::none_of(set.GetDatastore(),
                             [](const auto& entry) { return IsEEPROMProperty(entry.first); })) {
        return;
    }
    for (const auto& [id, value] : set.GetDatastore()) {
        SetProperty(id, value);
    }
    if (IsRequested(set, PropertyIds::DumpLogRequest)) {
        DumpLog();
        return;
    }
    if (IsRequested(set, PropertyIds::WriteThroughRequest)) {
        set.SetProperty(PropertyIds::WriteThroughRequest, Property(std::int32_t{0}));
        Unlock();
        try {
            WriteThrough();
        } catch (...) {
            Lock();  // a failed transfer must not leave the EEPROM open
            throw;
        }
        Lock();
    }
}
TRACED

const Property& PellandoEEPROM::GetProperty(std::uint16_t id) try {
    if (ConfigurationDataConverter::IsLogParameter(id)) {
        return GetLog().GetItem(id);
    }
    if (ConfigurationDataConverter::IsCalibrationParameter(id)) {
        return calibration_.GetProperty(id);
    }
    throw ResourceException("unknown property id = " + std::to_string(id), Here());
}
TRACED

void PellandoEEPROM::SetProperty(std::uint16_t id, const Property& value) try {
    if (ConfigurationDataConverter::IsLogParameter(id)) {
        GetLog(true).SetItem(id, value);
    } else if (ConfigurationDataConverter::IsCalibrationParameter(id)) {
        calibration_.SetProperty(id, value);
    }
}
TRACED

void PellandoEEPROM::StoreBinary(std::uint16_t id, const Bytes& data) try {
    if (id == PropertyIds::BinaryBlock) {
        if (data.size() != EepromMap::BinarySize) {
            throw ResourceException("Wrong Tallimer size", Here());
        }
        const auto second = data.begin() + EepromMap::BinaryFirstSize;
        functionality_->WriteEEPROM(EepromMap::BinaryFirst, Bytes(data.begin(), second));
        functionality_->WriteEEPROM(EepromMap::BinarySecond, Bytes(second, data.end()));
    } else if (IsRawWord(id)) {
        const std::uint32_t address = AddressOfRawWord(id);
        if (address >= EepromMap::EndOfLogArea || data.size() > EepromMap::EndOfLogArea - address) {
            throw ResourceException(AccessDenied, Here());
        }
        functionality_->WriteEEPROM(address, data);
    }
}
TRACED

Bytes PellandoEEPROM::LoadBinary(std::uint16_t id) try {
    if (id == PropertyIds::BinaryBlock) {
        Bytes first = Read(*functionality_, EepromMap::BinaryFirst, EepromMap::BinaryFirstSize);
        return Joined(std::move(first),
                      Read(*functionality_, EepromMap::BinarySecond, EepromMap::BinarySecondSize));
    }
    if (IsRawWord(id)) {
        return Read(*functionality_, AddressOfRawWord(id), EepromMap::RawWordSize);
    }
    return {};
}
TRACED

Bytes PellandoEEPROM::Dump() try {
    eat_->EnsureConsistency(calibration_);
    eat_->FitSection(calibration_, 0);
    PellandoLog& currentLog = GetLog(true);
    currentLog.UpdateChecksum();  // which decides the checksum item's size
    eat_->EnsureConsistency(currentLog);
    const Properties& items = currentLog.GetItems();
    eat_->FitSection(items, 0);
    FitSecondLog(*eat_, items);
    Bytes image(Protocol::EepromSize, UnusedByte);
    const auto at = [&image](std::ptrdiff_t address) { return image.begin() + address; };
    currentLog.Dump(at(EepromMap::MainLog), at(EepromMap::LogCopy));
    currentLog.Dump(at(EepromMap::LogCopy), at(EepromMap::EndOfLogArea));
    eat_->Dump(at(EepromMap::Table), at(EepromMap::Calibration));
    calibration_.Dump(at(EepromMap::Calibration), image.end(), true, true);
    return image;
}
TRACED

void PellandoEEPROM::Lock() try {
    if (locked_) {
        throw ResourceException("EEPROM already locked", Here());
    }
    locked_ = true;
}
TRACED

void PellandoEEPROM::Unlock() try {
    if (!locked_) {
        throw ResourceException("EEPROM already unlocked", Here());
    }
    locked_ = false;
}
TRACED

void PellandoEEPROM::ThrowIfLocked() const try {
    if (locked_) {
        throw ResourceException(AccessDenied, Here());
    }
}
TRACED

void PellandoEEPROM::WriteThrough() try {
    ThrowIfLocked();
    DumpLog();
}
TRACED

void PellandoEEPROM::DumpLog() try {
    log_->UpdateChecksum();  // which decides the checksum item's size
    if (log_->SizeOf() > logArea_) {
        throw ResourceException("Configuration data dump target too small", Here());
    }
    Bytes bytes(log_->SizeOf());
    log_->Dump(bytes.begin(), bytes.end());
    functionality_->WriteEEPROM(EepromMap::MainLog, bytes);
    functionality_->WriteEEPROM(EepromMap::LogCopy, bytes);
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
