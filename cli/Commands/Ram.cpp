#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "Output/ValueList.h"
#include "Service/Memory/PropertyText.h"
#include "Service/Memory/RamAccess.h"
#include "Service/Memory/RamParameters.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

struct ShowRamOptions {
    InstrumentOptions instrument;
    bool json = false;
};

void PrintSet(Session& session, const RamAccess::Properties& set) {
    Table table({{"ID", Table::Align::Right}, {"VALUE"}, {"MEANING"}});
    for (const auto& [id, value] : set.GetDatastore()) {
        table.AddRow({std::to_string(id), TextOf(value), MeaningOfParameter(id)});
    }
    table.Print(session.Out());
}

void ShowRam(Session& session, const ShowRamOptions& options) {
    OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options.instrument));
    const auto set =
        instrument.Do([](const OpenedInstrument::Commands& commands) { return RamAccess(commands).Load(); });
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()}, {"ram", set}});
    } else {
        PrintSet(session, set);
    }
}

struct SetRamOptions {
    InstrumentOptions instrument;
    std::vector<std::string> assignments;
    bool dryRun = false;
    bool json = false;
};

void SetRam(Session& session, const SetRamOptions& options) {
    const std::vector<Assignment> assignments = ParseAssignments(options.assignments);
    OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options.instrument));
    RamAccess::Properties before, set;
    instrument.Do([&](const OpenedInstrument::Commands& commands) {
        RamAccess ram(commands);
        before = ram.Load();
        set = WithParameters(before, assignments);
        if (!options.dryRun) {
            set = ram.StoreAndLoad(set);
        }
    });
    Rows changes(
        {{"ID", "id", Table::Align::Right}, {"BEFORE", "before"}, {}, {"AFTER", "after"}, {"MEANING"}});
    for (const std::uint16_t id : ParametersToShow(assignments, before, set)) {
        changes.Add(
            {id, CellOf(before.GetProperty(id)), "->", CellOf(set.GetProperty(id)), MeaningOfParameter(id)});
    }
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()},
                       {"dryRun", options.dryRun},
                       {"changes", changes.AsJson()}});
        return;
    }
    changes.Print(session.Out());
    if (options.dryRun) {
        session.Out()
            << "nothing was set; which measurement mode can count the times, and how it rounds them, "
               "shows when they are set\n";
    }
}

}  // namespace

void AddRam(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("ram", "show and set volatile parameters of an instrument");

    auto [show, showOptions] = NewCommand(group, session, "show", "show the volatile parameters", ShowRam);
    AddInstrumentOptions(show, showOptions.instrument);
    AddJsonFlag(show, showOptions.json);

    auto [set, setOptions] = NewCommand(
        group, session, "set",
        "set measurement parameters; chooses the measurement mode that can count the integration time",
        SetRam);
    set.Add("ID=VALUE", setOptions.assignments, "new values, for example 2009=0.05").Required();
    set.AddFlag("--dry-run", setOptions.dryRun, "show what would be set and set nothing").Group("Change");
    AddInstrumentOptions(set, setOptions.instrument);
    AddJsonFlag(set, setOptions.json);
}

}  // namespace Varnholt::Cli
