#include "Service/Memory/RamAccess.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <utility>
#include <vector>

#include "Protocol/PropertyIdentifiers.h"
#include "Service/Failure.h"

namespace Varnholt::Service {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
using DeviceDriver::Generic::Configuration::Property;
using DeviceDriver::Ostra::LowLevel::PellandoFunctionality;
using DeviceDriver::Ostra::LowLevel::PellandoRAM;
using Utilities::Exceptions::ResourceException;
namespace Ids = Protocol::PropertyIds;

constexpr double Microsecond = 1e-6;
constexpr double MicrosecondsPerSecond = 1e6;
constexpr std::uint32_t LongestCount = 65535;
constexpr double HalfACount = 0.5;
/// That an instrument could count, if it had the slowest time base.
constexpr std::uint32_t MostMicroseconds = LongestCount * std::numeric_limits<std::uint8_t>::max();

struct Mode {
    std::uint8_t count = 0;   ///< modes that the instrument has
    std::uint8_t number = 0;  ///< of this one, from 1
    std::uint8_t m3 = 0;
    std::uint8_t coarseFactor = 0;
    std::uint8_t tickMicroseconds = 0;
    std::uint8_t flags = 0;

    /// Microseconds that the model has counted in this mode: from `Shortest` on, and less than `End`.
    std::uint32_t Shortest() const { return std::uint32_t{coarseFactor} * tickMicroseconds; }
    std::uint32_t End() const { return LongestCount * tickMicroseconds; }
};

/// What an instrument without modes counts with.
constexpr Mode OnlyMode{.coarseFactor = 130, .tickMicroseconds = 68};

Mode CurrentMode(PellandoFunctionality& commands) {
    Mode mode;
    commands.GetMeasureMode(mode.count, mode.number, mode.m3, mode.coarseFactor, mode.tickMicroseconds,
                            mode.flags);
    return mode;
}

/// Goes through the modes as the model does; a mode that does not come when it is called ends the list. The
/// instrument is left in the last one that was called.
std::vector<Mode> ListModes(PellandoFunctionality& commands) {
    std::vector<Mode> modes;
    for (int number = 1; number <= std::numeric_limits<std::uint8_t>::max(); ++number) {
        commands.SetMeasureMode(static_cast<std::uint8_t>(number));
        const Mode mode = CurrentMode(commands);
        if (mode.number != number) {
            break;
        }
        modes.push_back(mode);
        if (number >= mode.count) {
            break;
        }
    }
    return modes;
}

std::string Describe(const std::vector<Mode>& modes) {
    std::string text;
    for (const Mode& mode : modes) {
        text += fmt::format("{}mode {}: {:.6g} s to {:.6g} s", text.empty() ? "" : "; ", mode.number,
                            mode.Shortest() * Microsecond, mode.End() * Microsecond);
    }
    return text;
}

/// The lowest float from `seconds` on that the model takes for `microseconds` at least: one or two further.
float NotBelow(std::uint32_t microseconds, float seconds) {
    while (PellandoRAM::SearchedMicroseconds(seconds) < microseconds) {
        seconds = std::nextafter(seconds, std::numeric_limits<float>::infinity());
    }
    return seconds;
}

/// The highest float up to `seconds` that the model takes for less than `microseconds`.
float Below(std::uint32_t microseconds, float seconds) {
    while (PellandoRAM::SearchedMicroseconds(seconds) >= microseconds) {
        seconds = std::nextafter(seconds, 0.0F);
    }
    return seconds;
}

/// A time of 0.000247 s means 247 us, although no float is 0.000247 and the model takes it for 246: where the
/// float's own rounding is all that keeps it from a whole number, the float that gives that number.
float AsWholeMicroseconds(float seconds) {
    const double product = seconds * MicrosecondsPerSecond;
    const double whole = std::round(product);
    const double rounding = product * (std::numeric_limits<float>::epsilon() / 2);
    const bool isMeant = product >= 0 && product <= MostMicroseconds && std::abs(product - whole) <= rounding;
    return isMeant ? NotBelow(static_cast<std::uint32_t>(whole), seconds) : seconds;
}

/// A time that the model counts so in the mode with this number; none where no time leads there, as an
/// earlier mode takes it or the mode itself does not.
std::optional<float> TimeOf(std::uint16_t count, std::uint8_t modeNumber, const std::vector<Mode>& modes) {
    std::uint32_t end = MostMicroseconds;
    for (const Mode& mode : modes) {
        if (mode.number != modeNumber) {
            end = std::min(end, mode.Shortest());
            continue;
        }
        end = std::min(end, mode.End());
        if (mode.Shortest() >= end) {
            break;
        }
        const double tick = mode.tickMicroseconds * Microsecond;
        const auto exact = static_cast<float>(count * tick);
        const float lowest = NotBelow(mode.Shortest(), static_cast<float>(mode.Shortest() * Microsecond));
        const float highest = Below(end, static_cast<float>(end * Microsecond));
        const float seconds = std::clamp(exact, lowest, highest);
        return std::lround(seconds / tick) == count ? std::optional(seconds) : std::nullopt;
    }
    return std::nullopt;
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
            throw Failure(
                FailureKind::BadData, fmt::format("{}={}: the instrument cannot count that far", id, wanted),
                fmt::format("the longest is {:.6g} s{}", LongestCount * unit,
                            id == Ids::SecondTime ? ", in the measurement mode that 2009 asks for" : ""));
        }
    }
}

}  // namespace

Properties RamAccess::Load() {
    PellandoRAM ram(commands_);
    Properties set("PhysicalConditions");
    ram.Load(set);
    if (HasModes(set)) {
        std::uint16_t p1 = 0, p2 = 0, p3 = 0;
        std::uint8_t p4 = 0, p5 = 0;
        commands_->GetMeasureParameters(p1, p2, p3, p4, p5);
        const Mode mode = CurrentMode(*commands_);
        const double tick = mode.tickMicroseconds * Microsecond;
        loaded_ = {static_cast<float>(p1 * tick), p1, mode.number};
        set.SetProperty(Ids::IntegrationTime, Property(loaded_->seconds));
        set.SetProperty(Ids::SecondTime, Property(static_cast<float>(p2 * mode.coarseFactor * tick)));
    }
    return set;
}

void RamAccess::SwitchMode(PellandoRAM& ram, Properties& set, std::uint8_t currentMode) {
    const float wanted = set.GetProperty(Ids::IntegrationTime).AsFloat();
    const bool isAsLoaded = loaded_ && loaded_->seconds == wanted && loaded_->mode == currentMode;
    set.SetProperty(Ids::IntegrationTime, Property(AsWholeMicroseconds(wanted)));
    try {
        ram.SwitchToPerfectMode(set);
        if (!isAsLoaded || CurrentMode(*commands_).number == currentMode) {
            return;
        }
    } catch (const ResourceException&) {
        if (!isAsLoaded) {
            throw;
        }
    }
    // The count was made of another time, which the mode's neighbours do not take.
    if (const auto time = TimeOf(loaded_->count, currentMode, ListModes(*commands_))) {
        set.SetProperty(Ids::IntegrationTime, Property(*time));
    }
    ram.SwitchToPerfectMode(set);
}

void RamAccess::Store(const Properties& set) {
    const bool hasModes = HasModes(set);
    const Mode before = hasModes ? CurrentMode(*commands_) : OnlyMode;
    PellandoRAM ram(commands_);
    Properties sent = set;
    try {
        if (hasModes) {
            SwitchMode(ram, sent, before.number);
        }
        CheckTimes(sent, hasModes ? CurrentMode(*commands_) : OnlyMode);
    } catch (const ResourceException& exception) {
        const std::string modes = Describe(ListModes(*commands_));
        commands_->SetMeasureMode(before.number);
        throw Failure(FailureKind::BadData,
                      fmt::format("{}: {} s fits none of the instrument's modes", exception.what(),
                                  set.GetProperty(Ids::IntegrationTime).AsFloat()),
                      modes);
    } catch (const Failure&) {
        if (hasModes) {
            commands_->SetMeasureMode(before.number);
        }
        throw;
    }
    ram.Store(sent);
}

Properties RamAccess::StoreAndLoad(const Properties& set) {
    Store(set);
    Properties stored = Load();
    // It cannot be loaded.
    stored.SetProperty(Ids::ThirdParameterReplacement, set.GetProperty(Ids::ThirdParameterReplacement));
    return stored;
}

double RamAccess::TimeUnit() {
    std::uint8_t m1 = 0, m3 = 0;
    std::uint16_t m2 = 0, m4 = 0, m5 = 0;
    commands_->GetMISC(m1, m2, m3, m4, m5);
    const Mode mode = m2 >= Ids::FirstMisc2WithModes ? CurrentMode(*commands_) : OnlyMode;
    return mode.tickMicroseconds * Microsecond;
}

}  // namespace Varnholt::Service
