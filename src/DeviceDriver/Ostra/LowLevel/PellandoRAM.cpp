#include "DeviceDriver/Ostra/LowLevel/PellandoRAM.h"

#include <algorithm>
#include <cmath>
#include <initializer_list>
#include <limits>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Ostra/LowLevel/ConfigurationDataConverter.h"
#include "Protocol/PropertyIdentifiers.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

using namespace Generic::Configuration;
using namespace Protocol::PropertyIds;
using Varnholt::Utilities::Tools::SmartPointer;

namespace {

constexpr float InitialTickSeconds = 6.8e-5F;
constexpr std::uint16_t InitialCoarseFactor = 130;
constexpr double MicrosecondsPerSecond = 1e6;
constexpr std::uint32_t LongestCount = 65535;
constexpr std::int32_t LargestThirdParameter = 256;
/// A mode is a byte that starts at 1.
constexpr int MostModes = 255;

struct Flag {
    std::uint16_t id;
    std::uint8_t bit;
};
constexpr Flag Flags[] = {{FlagBit0, 1U << 0}, {FlagBit1, 1U << 1}, {FlagBit2, 1U << 2}, {FlagBit3, 1U << 3}};

/// Truncates toward zero. What the integer cannot hold becomes its nearest value, and no number 0: any float
/// may come in.
template <class Integer>
Integer Truncated(double value) {
    if (std::isnan(value)) {
        return 0;
    }
    // The largest value itself may not be a double: compare with the power of two behind it.
    const double end = std::ldexp(1.0, std::numeric_limits<Integer>::digits);
    if (value >= end) {
        return std::numeric_limits<Integer>::max();
    }
    if (value < -end) {
        return std::numeric_limits<Integer>::min();
    }
    return static_cast<Integer>(value);
}

/// Rounds to the nearest count and keeps the 16 bits that the instrument takes.
std::uint16_t Count(double units) {
    return static_cast<std::uint16_t>(Truncated<std::int32_t>(units + 0.5));
}

Property Long(std::int32_t value) {
    return Property(value);
}

bool HoldsAny(const Properties& set, bool (*isWanted)(std::uint16_t)) {
    return std::ranges::any_of(set.GetDatastore(), [&](const auto& entry) { return isWanted(entry.first); });
}

bool IsFlagSet(const Properties& set, std::uint16_t id) {
    return set.GetProperty(id).AsLong() != 0;
}

Properties TemporaryContainer(std::uint16_t id, const Property& value) {
    Properties container("tmp container");
    container.SetProperty(id, value);
    return container;
}

Properties MakePhysicalConditions() {
    Properties set("PhysicalConditions");
    for (const std::uint16_t id :
         std::initializer_list<std::uint16_t>{2000, 2001, 2002, 2003, 2008, 2009, 2010, 2004, 2005, 2006,
                                              2012, 2013, 2020, 2011, 2014, 2015, 2016, 2017, 9189}) {
        const bool isFloat =
            id == SecondTime || id == IntegrationTime || id == FirstOfMisc2 || id == SecondOfMisc2;
        set.SetProperty(id, isFloat ? Property(-1.0F) : Long(-1));
    }
    return set;
}

}  // namespace

PellandoRAM::PellandoRAM(const SmartPointer<PellandoFunctionality>& instrument)
    : functionality_(instrument), tickSeconds_(InitialTickSeconds), coarseFactor_(InitialCoarseFactor) {}

const Properties& PellandoRAM::GetDefaultPhysicalConditons() try {
    static const Properties physicalConditions = MakePhysicalConditions();
    return physicalConditions;
}
TRACED

Property PellandoRAM::Load(std::uint16_t id) try {
    Properties container = TemporaryContainer(id, ConfigurationDataConverter::GetDefaultProperty(id));
    return Load(container).GetProperty(id);
}
TRACED

Properties& PellandoRAM::Load(Properties& set) try {
    const Properties& conditions = GetDefaultPhysicalConditons();
    if (set.GetItemCount() == 0 && set.GetName() == conditions.GetName()) {
        set = conditions;
    }
    if (HoldsAny(set, &ConfigurationDataConverter::IsMiscParameter)) {
        LoadMiscParameters(set);
    }
    if (HoldsAny(set, &ConfigurationDataConverter::IsMeasureParameter)) {
        LoadMeasureParameters(set);
    }
    return set;
}
TRACED

void PellandoRAM::Store(std::uint16_t id, const Property& value) try {
    Properties container = TemporaryContainer(id, value);
    Store(container);
}
TRACED

void PellandoRAM::Store(Properties& set) try {
    if (HoldsAny(set, &ConfigurationDataConverter::IsMeasureParameter)) {
        StoreMeasureParameters(set);
    }
}
TRACED

void PellandoRAM::LoadMiscParameters(Properties& set) try {
    std::uint8_t m1 = 0, m3 = 0;
    std::uint16_t m2 = 0, m4 = 0, m5 = 0;
    functionality_->GetMISC(m1, m2, m3, m4, m5);
    set.SetProperty(Misc1, Long(m1));
    set.SetProperty(Misc2, Long(m2));
    set.SetProperty(Misc3, Long(m3));
    set.SetProperty(Misc4, Long(m4));
    set.SetProperty(Misc5, Long(m5));
    const bool hasModes = m2 >= FirstMisc2WithModes;
    set.SetProperty(FirstOfMisc2, Property(hasModes ? 0.25F : 0.5F));
    set.SetProperty(SecondOfMisc2, Property(hasModes ? 0.005F : 0.012F));
}
TRACED

void PellandoRAM::LoadMeasureParameters(Properties& set) try {
    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0, p5 = 0;
    functionality_->GetMeasureParameters(p1, p2, p3, p4, p5);
    // The products are exact in double precision, so that each time is rounded once.
    const double tick = tickSeconds_;
    set.SetProperty(IntegrationTime, Property(static_cast<float>(tick * p1)));
    set.SetProperty(SecondTime, Property(static_cast<float>(tick * (std::uint32_t{p2} * coarseFactor_))));
    set.SetProperty(ThirdParameter, Long(p3));
    set.SetProperty(FifthParameter, Long(p5));
    for (const Flag& flag : Flags) {
        set.SetProperty(flag.id, Long((p4 & flag.bit) != 0 ? 1 : 0));
    }
}
TRACED

void PellandoRAM::StoreMeasureParameters(Properties& set) try {
    SwitchToPerfectMode(set);
    const double tick = tickSeconds_;
    const std::uint16_t p1 = Count(set.GetProperty(IntegrationTime).AsFloat() / tick);
    const std::uint16_t p2 = Count(set.GetProperty(SecondTime).AsFloat() / tick / coarseFactor_);
    auto p3 =
        static_cast<std::uint16_t>(std::min(set.GetProperty(ThirdParameter).AsLong(), LargestThirdParameter));
    std::uint8_t flags = 0;
    for (const Flag& flag : Flags) {
        if (!IsFlagSet(set, flag.id)) {
            continue;
        }
        if (flag.id == FlagBit0 && set.Contains(ThirdParameterReplacement) &&
            set.GetProperty(ThirdParameterReplacement).AsLong() > 0) {
            p3 = static_cast<std::uint16_t>(set.GetProperty(ThirdParameterReplacement).AsLong());
        } else {
            flags = static_cast<std::uint8_t>(flags | flag.bit);
        }
    }
    functionality_->SetMeasureParameters(p1, p2, p3, flags);
}
TRACED

std::uint32_t PellandoRAM::SearchedMicroseconds(float seconds) {
    // The double holds the product of two floats exactly; it is rounded once, to a float. Volatile, because
    // an x87 register would keep it unrounded.
    const volatile auto product = static_cast<float>(seconds * MicrosecondsPerSecond);
    return static_cast<std::uint32_t>(Truncated<std::int64_t>(product));
}

void PellandoRAM::SwitchToPerfectMode(const Properties& set) try {
    tickSeconds_ = InitialTickSeconds;
    coarseFactor_ = InitialCoarseFactor;
    if (set.GetProperty(Misc2).AsLong() < FirstMisc2WithModes) {
        perfectMode_ = false;
        return;
    }
    const std::uint32_t microseconds = SearchedMicroseconds(set.GetProperty(IntegrationTime).AsFloat());
    std::uint8_t mode = 0;
    for (int round = 0; round < MostModes; ++round) {
        mode = static_cast<std::uint8_t>(mode + 1);
        functionality_->SetMeasureMode(mode);
        std::uint8_t modeCount = 0, unused = 0, factor = 0, unitMicroseconds = 0, modeFlags = 0;
        functionality_->GetMeasureMode(modeCount, mode, unused, factor, unitMicroseconds, modeFlags);
        if (unitMicroseconds * LongestCount <= microseconds) {
            throw ResourceException("Integration time too high", Here());
        }
        if (std::uint32_t{factor} * unitMicroseconds <= microseconds) {
            perfectMode_ = (modeFlags & 1U) != 0;
            tickSeconds_ = static_cast<float>(unitMicroseconds / MicrosecondsPerSecond);
            coarseFactor_ = factor;
            return;
        }
        if (mode >= modeCount) {
            break;
        }
    }
    perfectMode_ = false;
    throw ResourceException("Integration time too low", Here());
}
TRACED

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
