#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <limits>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Memory/PropertyText.h"
#include "Memory/RamAccess.h"
#include "Output/Json.h"
#include "Output/Table.h"
#include "Output/ValueList.h"
#include "Protocol/PropertyIdentifiers.h"

namespace Varnholt::Cli {
namespace {

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
    const auto* const found = std::find_if(Meanings.begin(), Meanings.end(),
                                           [id](const Meaning& meaning) { return meaning.id == id; });
    return found == Meanings.end() ? nullptr : found;
}

struct ShowOptions {
    InstrumentOptions instrument;
    bool json = false;
};

void PrintSet(Session& session, const RamAccess::Properties& set) {
    Table table({{"ID", Table::Align::Right}, {"VALUE"}, {"MEANING"}});
    for (const auto& [id, value] : set.GetDatastore()) {
        const Meaning* const meaning = MeaningOf(id);
        table.AddRow({std::to_string(id), TextOf(value), meaning != nullptr ? meaning->text : "not loaded"});
    }
    table.Print(session.Out());
}

void Show(Session& session, const ShowOptions& options) {
    Instrument instrument(session, options.instrument);
    const auto set = RamAccess(instrument.SharedCommands()).Load();
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()}, {"ram", JsonOf(set)}});
    } else {
        PrintSet(session, set);
    }
}

struct SetOptions {
    InstrumentOptions instrument;
    std::vector<std::string> assignments;
    bool dryRun = false;
    bool json = false;
};

/// Refuses what the instrument would take for something else: it knows no signs, and what has fewer bits or a
/// limit would be cut off without a word.
void CheckRange(const Assignment& assignment, const Property& value, std::int32_t highest) {
    const bool isTime = assignment.id == Ids::IntegrationTime || assignment.id == Ids::SecondTime;
    if (isTime ? value.AsFloat() < 0 : value.AsLong() < 0) {
        throw ToolFailure(ExitCode::BadData, fmt::format("{}={}: the instrument knows no negative numbers",
                                                         assignment.id, assignment.value));
    }
    if (!isTime && value.AsLong() > highest) {
        throw ToolFailure(ExitCode::BadData, fmt::format("{}={}: at most {} can be sent", assignment.id,
                                                         assignment.value, highest));
    }
}

void CheckReplacement(const RamAccess::Properties& set) {
    const std::int32_t replacement = set.GetProperty(Ids::ThirdParameterReplacement).AsLong();
    if (replacement > 0 && set.GetProperty(Ids::FlagBit0).AsLong() == 0) {
        throw ToolFailure(ExitCode::Usage, "9189 takes the place of 2010 only together with 2008=1",
                          fmt::format("ostra ram set 9189={} 2008=1", replacement));
    }
}

RamAccess::Properties Changed(const RamAccess::Properties& loaded,
                              const std::vector<Assignment>& assignments) {
    auto set = loaded;
    for (const Assignment& assignment : assignments) {
        const Meaning* const meaning = MeaningOf(assignment.id);
        if (meaning == nullptr || meaning->highest == 0) {
            throw ToolFailure(ExitCode::Usage, fmt::format("{} cannot be set", assignment.id),
                              "2000, 2001, 2002, 2003, 2008, 2009, 2010 and 9189 can");
        }
        const Property value = ParseValue(assignment, set.GetProperty(assignment.id));
        CheckRange(assignment, value, meaning->highest);
        set.SetProperty(assignment.id, value);
    }
    CheckReplacement(set);
    return set;
}

/// What to show of a change: what was asked for, then what has changed with it, as a mode rounds all times
/// anew.
std::vector<std::uint16_t> IdsToShow(const std::vector<Assignment>& assignments,
                                     const RamAccess::Properties& before,
                                     const RamAccess::Properties& after) {
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

void Set(Session& session, const SetOptions& options) {
    const std::vector<Assignment> assignments = ParseAssignments(options.assignments);
    Instrument instrument(session, options.instrument);
    RamAccess ram(instrument.SharedCommands());
    const auto before = ram.Load();
    auto set = Changed(before, assignments);
    if (!options.dryRun) {
        const Property replacement = set.GetProperty(Ids::ThirdParameterReplacement);
        ram.Store(set);
        // What the instrument made of it: times are rounded to what its mode can count.
        set = ram.Load();
        set.SetProperty(Ids::ThirdParameterReplacement, replacement);  // which cannot be loaded
    }
    Json changes = Json::array();
    Table table({{"ID", Table::Align::Right}, {"BEFORE"}, {}, {"AFTER"}, {"MEANING"}});
    for (const std::uint16_t id : IdsToShow(assignments, before, set)) {
        const Property& old = before.GetProperty(id);
        const Property& now = set.GetProperty(id);
        changes.push_back({{"id", id}, {"before", JsonOf(old)}, {"after", JsonOf(now)}});
        table.AddRow({std::to_string(id), TextOf(old), "->", TextOf(now), MeaningOf(id)->text});
    }
    if (options.json) {
        session.Print(
            {{"identifier", instrument.Identifier()}, {"dryRun", options.dryRun}, {"changes", changes}});
        return;
    }
    table.Print(session.Out());
    if (options.dryRun) {
        session.Out()
            << "nothing was set; which measurement mode can count the times, and how it rounds them, "
               "shows when they are set\n";
    }
}

}  // namespace

void AddRam(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("ram", "show and set volatile parameters of an instrument");

    const auto show = std::make_shared<ShowOptions>();
    CommandSpec command = group.AddCommand("show", "show the volatile parameters");
    AddInstrumentOptions(command, show->instrument);
    AddJsonFlag(command, show->json);
    SetAction(command, session, show, Show);

    const auto set = std::make_shared<SetOptions>();
    command = group.AddCommand(
        "set",
        "set measurement parameters; chooses the measurement mode that can count the integration time");
    command.Add("ID=VALUE", set->assignments, "new values, for example 2009=0.05").Required();
    command.AddFlag("--dry-run", set->dryRun, "show what would be set and set nothing").Group("Change");
    AddInstrumentOptions(command, set->instrument);
    AddJsonFlag(command, set->json);
    SetAction(command, session, set, Set);
}

}  // namespace Varnholt::Cli
