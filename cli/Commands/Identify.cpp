#include <fmt/format.h>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Table.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    bool json = false;
};

void Identify(Session& session, const Options& options) {
    Service::OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options.instrument));
    const Service::Identity found = instrument.Identify();
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()},
                       {"name", Service::ShortNameOf(instrument.Identifier())},
                       {"chipId", found.chipId},
                       {"misc", {found.misc1, found.misc2, found.misc3, found.misc4, found.misc5}},
                       {"mode", found.mode},
                       {"cpld", found.cpld},
                       {"parameters", {found.p1, found.p2, found.p3, found.p4, found.p5}}});
        return;
    }
    Table table({{}, {}});
    table.AddRow({"identifier", instrument.Identifier()});
    table.AddRow({"name", Service::ShortNameOf(instrument.Identifier())});
    table.AddRow({"chip id", found.chipId});
    table.AddRow({"MISC m1 to m5", fmt::format("{}  {}  {}  {}  {}", found.misc1, found.misc2, found.misc3,
                                               found.misc4, found.misc5)});
    table.AddRow({"mode m1 to m6", fmt::format("{}", fmt::join(found.mode, "  "))});
    table.AddRow({"CPLD", fmt::format("0x{:04X}", found.cpld)});
    table.AddRow({"parameters p1 to p5",
                  fmt::format("{}  {}  {}  {}  {}", found.p1, found.p2, found.p3, found.p4, found.p5)});
    table.Print(session.Out());
}

}  // namespace

void AddIdentify(CommandSpec app, Session& session) {
    const auto options = std::make_shared<Options>();
    CommandSpec command =
        app.AddCommand("identify",
                       "show what an instrument says of itself: chip id, MISC values, mode, "
                       "CPLD, measurement parameters");
    AddInstrumentOptions(command, options->instrument);
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, Identify);
}

}  // namespace Varnholt::Cli
