#include "Commands/AllCommands.h"
#include "Commands/CommonOptions.h"
#include "Output/Json.h"
#include "Protocol/Instrument.h"
#include "Service/OpenedInstrument.h"

namespace Varnholt::Cli {
namespace {

struct ResetInstrumentOptions {
    InstrumentOptions instrument;
    std::uint16_t code = Protocol::OpeningResetCode;
    bool json = false;
};

void ResetInstrument(Session& session, const ResetInstrumentOptions& options) {
    Service::OpenedInstrument instrument(session.Context(), ChooseInstrument(session, options.instrument));
    instrument.Reset(options.code);
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()}, {"code", options.code}});
    } else {
        session.Out() << instrument.Identifier() << ": reset with code " << options.code << '\n';
    }
}

}  // namespace

void AddReset(CommandSpec app, Session& session) {
    auto [command, options] = NewCommand(app, session, "reset", "reset an instrument", ResetInstrument);
    command
        .Add("--code", options.code, "reset code, one byte (default: 31, the one that every opening sends)")
        .Type("N")
        .Between(0, 255);
    AddInstrumentOptions(command, options.instrument);
    AddJsonFlag(command, options.json);
}

}  // namespace Varnholt::Cli
