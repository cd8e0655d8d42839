#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "Output/ValueList.h"
#include "Service/Memory/PropertyText.h"
#include "Service/Memory/RamAccess.h"
#include "Service/Memory/RamParameters.h"

namespace Varnholt::Cli {
namespace {

using namespace Service;

void ShowRam(Session& session, const InstrumentOptions& options) {
    auto instrument = OpenInstrument(session, options);
    const auto set =
        instrument.Do([](const OpenedInstrument::Commands& commands) { return RamAccess(commands).Load(); });
    Rows table({{"ID", nullptr, Rows::Right}, {"VALUE"}, {"MEANING"}});
    for (const auto& [id, value] : set.GetDatastore()) {
        table.Add({id, TextOf(value), MeaningOfParameter(id)});
    }
    session.Print(options.json, {{"identifier", instrument.Identifier()}, {"ram", set}}, table.Text());
}

struct SetRamOptions : InstrumentOptions {
    std::vector<std::string> assignments;
    bool dryRun = false;
};

void SetRam(Session& session, const SetRamOptions& options) {
    const std::vector<Assignment> assignments = ParseAssignments(options.assignments);
    auto instrument = OpenInstrument(session, options);
    RamAccess::Properties before, set;
    instrument.Do([&](const OpenedInstrument::Commands& commands) {
        RamAccess ram(commands);
        before = ram.Load();
        set = WithParameters(before, assignments);
        if (!options.dryRun) {
            set = ram.StoreAndLoad(set);
        }
    });
    Rows changes({{"ID", "id", Rows::Right}, {"BEFORE", "before"}, {}, {"AFTER", "after"}, {"MEANING"}});
    for (const std::uint16_t id : ParametersToShow(assignments, before, set)) {
        changes.Add(
            {id, CellOf(before.GetProperty(id)), "->", CellOf(set.GetProperty(id)), MeaningOfParameter(id)});
    }
    session.Print(
        options.json,
        {{"identifier", instrument.Identifier()}, {"dryRun", options.dryRun}, {"changes", changes.AsJson()}},
        changes.Text() + (options.dryRun ? "nothing was set; which measurement mode can count the times, and "
                                           "how it rounds them, shows when they are set\n"
                                         : ""));
}

}  // namespace

void AddRam(CommandSpec app, Session& session) {
    CommandSpec group = app.AddGroup("ram", "show and set volatile parameters of an instrument");

    auto [show, showOptions] = NewCommand(group, session, "show", "show the volatile parameters", ShowRam);
    AddCommonOptions(show, showOptions);

    auto [set, setOptions] = NewCommand(
        group, session, "set",
        "set measurement parameters; chooses the measurement mode that can count the integration time",
        SetRam);
    set.Add("ID=VALUE", setOptions.assignments, "new values, for example 2009=0.05", {.isRequired = true});
    set.Under("Change").Add("--dry-run", setOptions.dryRun, "show what would be set and set nothing");
    AddCommonOptions(set, setOptions);
}

}  // namespace Varnholt::Cli
