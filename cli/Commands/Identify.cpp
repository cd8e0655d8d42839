#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Cli {
namespace {

struct IdentifyOptions {
    InstrumentOptions instrument;
    bool json = false;
};

void Identify(Session& session, const IdentifyOptions& options) {
    Service::OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options.instrument));
    const Service::Identity found = instrument.Identify();
    const std::string name = Service::ShortNameOf(instrument.Identifier());
    const std::array misc{unsigned{found.misc1}, unsigned{found.misc2}, unsigned{found.misc3},
                          unsigned{found.misc4}, unsigned{found.misc5}};
    const std::array parameters{unsigned{found.p1}, unsigned{found.p2}, unsigned{found.p3},
                                unsigned{found.p4}, unsigned{found.p5}};
    const auto inARow = [](const auto& numbers) { return fmt::format("{}", fmt::join(numbers, "  ")); };
    struct Line {
        const char* label;
        const char* member;
        Rows::Cell cell;
    };
    Json result;
    Table table({{}, {}});
    for (const Line& line : {
             Line{"identifier", "identifier", instrument.Identifier()},
             Line{"name", "name", name},
             Line{"chip id", "chipId", found.chipId},
             Line{"MISC m1 to m5", "misc", {inARow(misc), misc}},
             Line{"mode m1 to m6", "mode", {inARow(found.mode), found.mode}},
             Line{"CPLD", "cpld", {fmt::format("0x{:04X}", found.cpld), found.cpld}},
             Line{"parameters p1 to p5", "parameters", {inARow(parameters), parameters}},
         }) {
        result.Add(line.member, *line.cell.value);
        table.AddRow({line.label, line.cell.text});
    }
    if (options.json) {
        session.Print(result);
    } else {
        table.Print(session.Out());
    }
}

}  // namespace

void AddIdentify(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "identify",
                   "show what an instrument says of itself: chip id, MISC values, mode, "
                   "CPLD, measurement parameters",
                   Identify);
    AddInstrumentOptions(command, options.instrument);
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
