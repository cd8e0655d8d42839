#include "Memory/RamAccess.h"

#include <fmt/format.h>

#include <array>
#include <utility>

#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"
#include "Protocol/PropertyIdentifiers.h"

namespace Varnholt::Cli {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
using DeviceDriver::Generic::Configuration::Property;
using DeviceDriver::Ostra::LowLevel::PellandoRAM;
namespace Ids = Protocol::PropertyIds;

constexpr double Microsecond = 1e-6;
constexpr std::uint32_t LongestCount = 65535;
constexpr double HalfACount = 0.5;

struct Mode {
    std::uint8_t count = 0;   ///< modes that the instrument has
    std::uint8_t number = 0;  ///< of this one, from 1
    std::uint8_t m3 = 0;
    std::uint8_t coarseFactor = 0;
    std::uint8_t tickMicroseconds = 0;
    std::uint8_t flags = 0;
};

/// What an instrument without modes counts with.
constexpr Mode OnlyMode{
    .count = 1, .number = 1, .m3 = 0, .coarseFactor = 130, .tickMicroseconds = 68, .flags = 0};

Mode CurrentMode(Instrument& instrument) {
    Mode mode;
    instrument.Commands().GetMeasureMode(mode.count, mode.number, mode.m3, mode.coarseFactor,
                                         mode.tickMicroseconds, mode.flags);
    return mode;
}

bool HasModes(const Properties& set) {
    return set.GetProperty(Ids::Misc2).AsLong() >= Ids::FirstMisc2WithModes;
}

/// A count that is too large for its 16 bits would be cut off, and another time be set without a word.
void CheckTimes(const Properties& set, const Mode& mode) {
    const double tick = mode.tickMicroseconds * Microsecond;
    const std::array times{std::pair{Ids::IntegrationTime, tick},
                           std::pair{Ids::SecondTime, tick * mode.coarseFactor}};
    for (const auto& [id, unit] : times) {
        const float wanted = set.GetProperty(id).AsFloat();
        if (wanted / unit >= LongestCount + HalfACount) {
            throw ToolFailure(
                ExitCode::BadData, fmt::format("{}={}: the instrument cannot count that far", id, wanted),
                fmt::format("the longest is {:.6g} s{}", LongestCount * unit,
                            id == Ids::SecondTime ? ", in the measurement mode that 2009 asks for" : ""));
        }
    }
}

}  // namespace

Properties RamAccess::Load() {
    PellandoRAM ram(instrument.SharedCommands());
    Properties set("PhysicalConditions");
    ram.Load(set);
    if (HasModes(set)) {
        std::uint16_t p1 = 0, p2 = 0, p3 = 0;
        std::uint8_t p4 = 0, p5 = 0;
        instrument.Commands().GetMeasureParameters(p1, p2, p3, p4, p5);
        const Mode mode = CurrentMode(instrument);
        const double tick = mode.tickMicroseconds * Microsecond;
        set.SetProperty(Ids::IntegrationTime, Property(static_cast<float>(p1 * tick)));
        set.SetProperty(Ids::SecondTime, Property(static_cast<float>(p2 * mode.coarseFactor * tick)));
    }
    return set;
}

void RamAccess::Store(Properties& set) {
    const bool hasModes = HasModes(set);
    const Mode before = hasModes ? CurrentMode(instrument) : OnlyMode;
    PellandoRAM ram(instrument.SharedCommands());
    try {
        ram.SwitchToPerfectMode(set);
        CheckTimes(set, hasModes ? CurrentMode(instrument) : OnlyMode);
    } catch (const Utilities::Exceptions::ResourceException& exception) {
        const std::string modes = DescribeModes();
        instrument.Commands().SetMeasureMode(before.number);
        throw ToolFailure(ExitCode::BadData,
                          fmt::format("{}: {} s fits none of the instrument's modes", exception.what(),
                                      set.GetProperty(Ids::IntegrationTime).AsFloat()),
                          modes);
    } catch (const ToolFailure&) {
        if (hasModes) {
            instrument.Commands().SetMeasureMode(before.number);
        }
        throw;
    }
    ram.Store(set);
}

double RamAccess::TimeUnit() {
    std::uint8_t m1 = 0, m3 = 0;
    std::uint16_t m2 = 0, m4 = 0, m5 = 0;
    instrument.Commands().GetMISC(m1, m2, m3, m4, m5);
    const Mode mode = m2 >= Ids::FirstMisc2WithModes ? CurrentMode(instrument) : OnlyMode;
    return mode.tickMicroseconds * Microsecond;
}

/// Goes through the modes as the model does; a mode that does not come when it is called ends the list.
std::string RamAccess::DescribeModes() {
    std::string text;
    for (int number = 1; number <= 255; ++number) {
        instrument.Commands().SetMeasureMode(static_cast<std::uint8_t>(number));
        const Mode mode = CurrentMode(instrument);
        if (mode.number != number) {
            break;
        }
        const double tick = mode.tickMicroseconds * Microsecond;
        text += fmt::format("{}mode {}: {:.6g} s to {:.6g} s", text.empty() ? "" : "; ", number,
                            mode.coarseFactor * tick, LongestCount * tick);
        if (number >= mode.count) {
            break;
        }
    }
    return text;
}

}  // namespace Varnholt::Cli
