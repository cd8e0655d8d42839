#include "Commands.h"

#include <algorithm>

#include "FreshEeprom.h"
#include "Protocol/ByteOrder.h"

namespace Varnholt::Simulator {
namespace {

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
            if (data.size() < 7) {
                return false;
            }
            parameters = {LoadBig16(&data[0]), LoadBig16(&data[2]), LoadBig16(&data[4]), data[6]};
            return true;
        case Request::SetMeasureMode:
            if (data.empty()) {
                return false;
            }
            // A mode that it does not have changes nothing.
            if (HasModes() && data[0] >= 1 && data[0] <= settings_.modes.size()) {
                mode = data[0];
            }
            return true;
        case Request::WriteEeprom:
            return StartWrite(eeprom, data);
        case Request::DownloadEepromFirmware:
            return StartWrite(eepromFirmware, data);
        case Request::ReadEeprom:
            return StartRead(data);
        case Request::WriteCpld:
            if (data.size() < 6) {
                return false;
            }
            cpld = {LoadBig16(&data[0]), LoadBig16(&data[2]), LoadBig16(&data[4])};
            return true;
        case Request::DownloadRamFirmware:
            if (setup.value + data.size() > ramFirmware.size()) {
                return false;
            }
            std::ranges::copy(data, ramFirmware.begin() + setup.value);
            return true;
        case Request::Reset:
            if (data.empty()) {
                return false;
            }
            // Ends what is under way; what was set stays until power is lost.
            answers_.Stop();
            write_.Stop();
            lastResetCode = data[0];
            ++resets;
            return true;
        case Request::ButtonReport:
            ++buttonReports;
            return true;
        default:
            return false;
    }
}

bool Commands::StartWrite(std::vector<std::uint8_t>& memory, std::span<const std::uint8_t> data) {
    write_.Stop();
    if (data.size() < 6) {
        return false;
    }
    const std::uint32_t address = LoadBig32(&data[0]);
    const std::uint32_t length = LoadBig16(&data[4]);
    if (address > memory.size() || length > memory.size() - address) {
        return false;
    }
    write_.Start(memory, address, length);
    return true;
}

bool Commands::StartRead(std::span<const std::uint8_t> data) {
    answers_.Stop();
    if (data.size() < 6) {
        return false;
    }
    const std::uint32_t address = LoadBig32(&data[0]);
    const std::uint32_t length = LoadBig16(&data[4]);
    if (address > eeprom.size() || length > eeprom.size() - address) {
        return false;
    }
    const auto first = eeprom.begin() + static_cast<std::ptrdiff_t>(address);
    answers_.StartMemory({first, first + static_cast<std::ptrdiff_t>(length)});
    return true;
}

std::optional<std::size_t> Commands::In(const Platform::Usb::SetupPacket& setup,
                                        std::span<std::uint8_t, LongestAnswer> answer) {
    switch (static_cast<Request>(setup.request)) {
        case Request::GetMeasureParameters:
            StoreBig16(&answer[0], parameters.p1);
            StoreBig16(&answer[2], parameters.p2);
            StoreBig16(&answer[4], parameters.p3);
            answer[6] = parameters.p4;
            answer[7] = settings_.fifthParameter;
            return 8;
        case Request::GetMeasureMode: {
            const MeasureMode& current = CurrentMode();
            const auto count = static_cast<std::uint8_t>(HasModes() ? settings_.modes.size() : 1);
            answer[0] = settings_.announcedModes ? settings_.announcedModes : count;
            answer[1] = mode;
            answer[2] = 0;
            answer[3] = current.coarseFactor;
            answer[4] = current.tickMicroseconds;
            answer[5] = current.flags;
            return 6;
        }
        case Request::ReadCpld:
            StoreBig16(&answer[0], cpld[0]);
            return 2;
        case Request::GetMisc:
            StoreBig16(&answer[0], settings_.firmware);
            StoreBig16(&answer[2], settings_.misc.m4);
            StoreBig16(&answer[4], settings_.misc.m5);
            answer[6] = settings_.misc.m1;
            answer[7] = settings_.misc.m3;
            return 8;
        case Request::GetChipId:
            std::ranges::copy(settings_.chipId, answer.begin());
            return 8;
        default:
            return std::nullopt;
    }
}

}  // namespace Varnholt::Simulator
