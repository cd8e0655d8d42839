#include <fmt/format.h>

#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Cli {
namespace {

struct ResetOptions : InstrumentOptions {
    std::uint16_t code = Protocol::OpeningResetCode;
};

void Reset(Session& session, const ResetOptions& options) {
    auto instrument = OpenInstrument(session, options);
    instrument.Reset(options.code);
    session.Print(options.json, {{"identifier", instrument.Identifier()}, {"code", options.code}},
                  fmt::format("{}: reset with code {}\n", instrument.Identifier(), options.code));
}

}  // namespace

void AddReset(CommandSpec app, Session& session) {
    auto [command, options] = NewCommand(app, session, "reset", "reset an instrument", Reset);
    command.Add("--code", options.code,
                "reset code, one byte (default: 31, the one that every opening sends)",
                {.type = "N", .between = {{0, 255}}});
    AddCommonOptions(command, options);
}

}  // namespace Varnholt::Cli
