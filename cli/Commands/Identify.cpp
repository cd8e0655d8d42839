#include <fmt/format.h>

#include <array>

#include "Commands/Commands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Output/Table.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    bool json = false;
};

struct Identity {
    std::string chipId;
    std::uint8_t misc1 = 0, misc3 = 0;
    std::uint16_t misc2 = 0, misc4 = 0, misc5 = 0;
    std::array<std::uint8_t, 6> mode{};
    std::uint16_t cpld = 0;
    std::uint16_t p1 = 0, p2 = 0, p3 = 0;
    std::uint8_t p4 = 0, p5 = 0;
};

Identity Ask(Instrument& instrument) {
    Identity found;
    Instrument::CommandSet& commands = instrument.Commands();
    found.chipId = instrument.ChipId();
    commands.GetMISC(found.misc1, found.misc2, found.misc3, found.misc4, found.misc5);
    auto& mode = found.mode;
    commands.GetMeasureMode(mode[0], mode[1], mode[2], mode[3], mode[4], mode[5]);
    commands.ReadCPLD(found.cpld);
    commands.GetMeasureParameters(found.p1, found.p2, found.p3, found.p4, found.p5);
    return found;
}

void Identify(Session& session, const Options& options) {
    Instrument instrument(session, options.instrument);
    const Identity found = Ask(instrument);
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()},
                       {"name", ShortNameOf(instrument.Identifier())},
                       {"chipId", found.chipId},
                       {"misc", {found.misc1, found.misc2, found.misc3, found.misc4, found.misc5}},
                       {"mode", found.mode},
                       {"cpld", found.cpld},
                       {"parameters", {found.p1, found.p2, found.p3, found.p4, found.p5}}});
        return;
    }
    Table table({{}, {}});
    table.AddRow({"identifier", instrument.Identifier()});
    table.AddRow({"name", ShortNameOf(instrument.Identifier())});
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
