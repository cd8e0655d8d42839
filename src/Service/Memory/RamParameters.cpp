#include "Service/Memory/RamParameters.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <limits>

#include "Protocol/PropertyIdentifiers.h"
#include "Service/Failure.h"

namespace Varnholt::Service {
namespace {

using DeviceDriver::Generic::Configuration::Properties;
namespace Ids = Protocol::PropertyIds;

struct Meaning {
    std::uint16_t id;
    const char* text;
    std::int32_t highest;  ///< that can be set; 0: nothing can
};
constexpr std::int32_t ByMode = 1;  // how far a time is counted depends on the mode
constexpr std::array Meanings{
    Meaning{Ids::IntegrationTime, "integration time, seconds", ByMode},
    Meaning{Ids::SecondTime, "second time, seconds", ByMode},
    Meaning{Ids::ThirdParameter, "third parameter, at most 256", 256},
    Meaning{Ids::FlagBit0, "flag, bit 0", 1},
    Meaning{Ids::FlagBit1, "flag, bit 1", 1},
    Meaning{Ids::FlagBit2, "flag, bit 2", 1},
    Meaning{Ids::FlagBit3, "flag, bit 3", 1},
    Meaning{Ids::ThirdParameterReplacement, "in the place of 2010, with 2008",
            std::numeric_limits<std::uint16_t>::max()},
    Meaning{Ids::FifthParameter, "fifth parameter", 0},
    Meaning{Ids::Misc1, "MISC m1", 0},
    Meaning{Ids::Misc2, "MISC m2", 0},
    Meaning{Ids::Misc3, "MISC m3", 0},
    Meaning{Ids::Misc4, "MISC m4", 0},
    Meaning{Ids::Misc5, "MISC m5", 0},
    Meaning{Ids::FirstOfMisc2, "from MISC m2", 0},
    Meaning{Ids::SecondOfMisc2, "from MISC m2", 0},
};

const Meaning* MeaningOf(std::uint16_t id) {
    const auto* const found = std::ranges::find(Meanings, id, &Meaning::id);
    return found == Meanings.end() ? nullptr : found;
}

void CheckRange(const Assignment& assignment, const Property& value, std::int32_t highest) {
    const bool isTime = assignment.id == Ids::IntegrationTime || assignment.id == Ids::SecondTime;
    if (isTime ? value.AsFloat() < 0 : value.AsLong() < 0) {
        throw Failure(FailureKind::BadData, fmt::format("{}={}: the instrument knows no negative numbers",
                                                        assignment.id, assignment.value));
    }
    if (!isTime && value.AsLong() > highest) {
        throw Failure(FailureKind::BadData,
                      fmt::format("{}={}: at most {} can be sent", assignment.id, assignment.value, highest));
    }
}

void CheckReplacement(const Properties& set) {
    const std::int32_t replacement = set.GetProperty(Ids::ThirdParameterReplacement).AsLong();
    if (replacement > 0 && set.GetProperty(Ids::FlagBit0).AsLong() == 0) {
        throw Failure(FailureKind::BadArgument, "9189 takes the place of 2010 only together with 2008=1",
                      fmt::format("ostra ram set 9189={} 2008=1", replacement));
    }
}

}  // namespace

const char* MeaningOfParameter(std::uint16_t id) {
    const Meaning* const meaning = MeaningOf(id);
    return meaning != nullptr ? meaning->text : "not loaded";
}

Properties WithParameters(const Properties& loaded, const std::vector<Assignment>& assignments) {
    auto set = loaded;
    for (const Assignment& assignment : assignments) {
        const Meaning* const meaning = MeaningOf(assignment.id);
        if (meaning == nullptr || meaning->highest == 0) {
            throw Failure(FailureKind::BadArgument, fmt::format("{} cannot be set", assignment.id),
                          "2000, 2001, 2002, 2003, 2008, 2009, 2010 and 9189 can");
        }
        const Property value = ParseValue(assignment, set.GetProperty(assignment.id));
        CheckRange(assignment, value, meaning->highest);
        set.SetProperty(assignment.id, value);
    }
    CheckReplacement(set);
    return set;
}

std::vector<std::uint16_t> ParametersToShow(const std::vector<Assignment>& assignments,
                                            const Properties& before, const Properties& after) {
    std::vector<std::uint16_t> ids;
    const auto add = [&ids](std::uint16_t id) {
        if (std::ranges::find(ids, id) == ids.end()) {
            ids.push_back(id);
        }
    };
    for (const Assignment& assignment : assignments) {
        add(assignment.id);
    }
    for (const Meaning& meaning : Meanings) {
        if (TextOf(before.GetProperty(meaning.id)) != TextOf(after.GetProperty(meaning.id))) {
            add(meaning.id);
        }
    }
    return ids;
}

}  // namespace Varnholt::Service
