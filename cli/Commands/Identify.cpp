#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Rows.h"

namespace Varnholt::Cli {
namespace {

void Identify(Session& session, const InstrumentOptions& options) {
    auto instrument = OpenInstrument(session, options);
    const Service::Identity found = instrument.Identify();
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
    Rows table({{}, {}});
    for (const Line& line : {
             Line{"identifier", "identifier", instrument.Identifier()},
             Line{"name", "name", Service::ShortNameOf(instrument.Identifier())},
             Line{"chip id", "chipId", found.chipId},
             Line{"MISC m1 to m5", "misc", {inARow(misc), misc}},
             Line{"mode m1 to m6", "mode", {inARow(found.mode), found.mode}},
             Line{"CPLD", "cpld", {fmt::format("0x{:04X}", found.cpld), found.cpld}},
             Line{"parameters p1 to p5", "parameters", {inARow(parameters), parameters}},
         }) {
        result.Add(line.member, *line.cell.value);
        table.Add({line.label, line.cell});
    }
    session.Print(options.json, result, table.Text());
}

}  // namespace

void AddIdentify(CommandSpec app, Session& session) {
    auto [command, options] =
        NewCommand(app, session, "identify",
                   "show what an instrument says of itself: chip id, MISC values, mode, "
                   "CPLD, measurement parameters",
                   Identify);
    AddCommonOptions(command, options);
}

}  // namespace Varnholt::Cli
