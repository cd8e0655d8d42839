#include "Commands.h"

#include <algorithm>

#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Simulator {
namespace {

namespace DataStage = Protocol::DataStage;
using Protocol::LoadBig16;
using Protocol::LoadBig32;
using Protocol::Request;
using Protocol::StoreBig16;

constexpr std::size_t FirmwareMemory = 0x10000;
constexpr MeasureMode OnlyModeOfOldFirmware{130, 68, 0};

}  // namespace

Commands::Commands(const InstrumentSettings& instrumentSettings)
    : eeprom(instrumentSettings.eeprom),
      eepromFirmware(FirmwareMemory, 0xFF),
      ramFirmware(FirmwareMemory),
      settings_(instrumentSettings),
      sensor_(settings_.seed, settings_.light, settings_.gain),
      answers_(sensor_) {
    if (eeprom.empty()) {
        eeprom = FreshEeprom();
    }
    eeprom.resize(Protocol::EepromSize, 0xFF);
}

void Commands::PowerOff() {
    answers_.Stop();
    write_.Stop();
    parameters = {};
    mode = 1;
    cpld = {};
    std::ranges::fill(ramFirmware, std::uint8_t{0});
}

const MeasureMode& Commands::CurrentMode() const {
    return HasModes() ? settings_.modes[mode - std::size_t{1}] : OnlyModeOfOldFirmware;
}

bool Commands::HasModes() const {
    return settings_.firmware >= NewFirmware && !settings_.modes.empty();
}

Exposure Commands::NextExposure() const {
    return {std::uint64_t{parameters.p1} * CurrentMode().tickMicroseconds,
            std::max<std::uint32_t>(parameters.p3, 1)};
}

bool Commands::Out(const Platform::Usb::SetupPacket& setup, std::span<const std::uint8_t> data) {
    switch (static_cast<Request>(setup.request)) {
        case Request::Measure:
            answers_.StartMeasurement(NextExposure(), measurements, settings_.scanBytes);
            ++measurements;
            return true;
        case Request::SetMeasureParameters:
            return SetParameters(data);
        case Request::SetMeasureMode:
            return SetMode(data);
        case Request::WriteEeprom:
            return StartWrite(eeprom, data);
        case Request::DownloadEepromFirmware:
            return StartWrite(eepromFirmware, data);
        case Request::ReadEeprom:
            return StartRead(data);
        case Request::WriteCpld:
            return WriteCpld(data);
        case Request::DownloadRamFirmware:
            return DownloadToRam(setup.value, data);
        case Request::Reset:
            return Reset(data);
        case Request::ButtonReport:
            ++buttonReports;
            return true;
        default:
            return false;
    }
}

bool Commands::SetParameters(std::span<const std::uint8_t> data) {
    if (data.size() <= DataStage::P4) {
        return false;
    }
    parameters = {LoadBig16(&data[DataStage::P1]), LoadBig16(&data[DataStage::P2]),
                  LoadBig16(&data[DataStage::P3]), data[DataStage::P4]};
    return true;
}

bool Commands::SetMode(std::span<const std::uint8_t> data) {
    if (data.size() < DataStage::SetModeSize) {
        return false;
    }
    // A mode that it does not have changes nothing.
    if (HasModes() && data[0] >= 1 && data[0] <= settings_.modes.size()) {
        mode = data[0];
    }
    return true;
}

bool Commands::WriteCpld(std::span<const std::uint8_t> data) {
    if (data.size() < DataStage::WriteCpldSize) {
        return false;
    }
    cpld = {LoadBig16(&data[DataStage::C1]), LoadBig16(&data[DataStage::C2]),
            LoadBig16(&data[DataStage::C3])};
    return true;
}

bool Commands::DownloadToRam(std::uint16_t address, std::span<const std::uint8_t> data) {
    if (address + data.size() > ramFirmware.size()) {
        return false;
    }
    std::ranges::copy(data, ramFirmware.begin() + address);
    return true;
}

/// Ends what is under way; what was set stays until power is lost.
bool Commands::Reset(std::span<const std::uint8_t> data) {
    if (data.size() < DataStage::ResetSize) {
        return false;
    }
    answers_.Stop();
    write_.Stop();
    lastResetCode = data[0];
    ++resets;
    return true;
}

std::optional<Commands::Area> Commands::AreaOf(std::span<const std::uint8_t> data, std::size_t memorySize) {
    if (data.size() < DataStage::Length + sizeof(std::uint16_t)) {
        return std::nullopt;
    }
    const Area area{LoadBig32(&data[DataStage::Address]), LoadBig16(&data[DataStage::Length])};
    const bool isInside = area.address <= memorySize && area.length <= memorySize - area.address;
    return isInside ? std::optional(area) : std::nullopt;
}

bool Commands::StartWrite(std::vector<std::uint8_t>& memory, std::span<const std::uint8_t> data) {
    write_.Stop();
    const auto area = AreaOf(data, memory.size());
    if (area) {
        write_.Start(memory, area->address, area->length);
    }
    return area.has_value();
}

bool Commands::StartRead(std::span<const std::uint8_t> data) {
    answers_.Stop();
    const auto area = AreaOf(data, eeprom.size());
    if (area) {
        const auto first = eeprom.begin() + static_cast<std::ptrdiff_t>(area->address);
        answers_.StartMemory({first, first + static_cast<std::ptrdiff_t>(area->length)});
    }
    return area.has_value();
}

std::size_t Commands::AnswerMode(std::span<std::uint8_t, LongestAnswer> answer) const {
    const MeasureMode& current = CurrentMode();
    answer[0] = static_cast<std::uint8_t>(HasModes() ? settings_.modes.size() : 1);
    answer[1] = mode;
    answer[2] = 0;
    answer[3] = current.coarseFactor;
    answer[4] = current.tickMicroseconds;
    answer[5] = current.flags;
    return DataStage::MeasureModeSize;
}

std::optional<std::size_t> Commands::In(const Platform::Usb::SetupPacket& setup,
                                        std::span<std::uint8_t, LongestAnswer> answer) {
    switch (static_cast<Request>(setup.request)) {
        case Request::GetMeasureParameters:
            StoreBig16(&answer[DataStage::P1], parameters.p1);
            StoreBig16(&answer[DataStage::P2], parameters.p2);
            StoreBig16(&answer[DataStage::P3], parameters.p3);
            answer[DataStage::P4] = parameters.p4;
            answer[DataStage::P5] = settings_.fifthParameter;
            return DataStage::MeasureParametersSize;
        case Request::GetMeasureMode:
            return AnswerMode(answer);
        case Request::ReadCpld:
            StoreBig16(answer.data(), cpld[0]);
            return DataStage::ReadCpldSize;
        case Request::GetMisc:
            StoreBig16(&answer[DataStage::M2], settings_.firmware);
            StoreBig16(&answer[DataStage::M4], settings_.misc.m4);
            StoreBig16(&answer[DataStage::M5], settings_.misc.m5);
            answer[DataStage::M1] = settings_.misc.m1;
            answer[DataStage::M3] = settings_.misc.m3;
            return DataStage::MiscSize;
        case Request::GetChipId:
            std::ranges::copy(settings_.chipId, answer.begin());
            return DataStage::ChipIdSize;
        default:
            return std::nullopt;
    }
}

}  // namespace Varnholt::Simulator
