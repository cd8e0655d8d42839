#include "Commands/CommandLine.h"
#include "Commands/Commands.h"
#include "Protocol/Instrument.h"

namespace Varnholt::Cli {
namespace {

struct Options {
    InstrumentOptions instrument;
    std::uint16_t code = Protocol::OpeningResetCode;
    bool json = false;
};

void Reset(Session& session, const Options& options) {
    Instrument instrument(session, options.instrument);
    instrument.Commands().Reset(options.code);
    if (options.json) {
        session.Print({{"identifier", instrument.Identifier()}, {"code", options.code}});
    } else {
        session.Out() << instrument.Identifier() << ": reset with code " << options.code << '\n';
    }
}

}  // namespace

void AddReset(CLI::App& app, Session& session) {
    const auto options = std::make_shared<Options>();
    CLI::App* const command = app.add_subcommand("reset", "reset an instrument");
    command
        ->add_option("--code", options->code,
                     "reset code, one byte (default: 31, the one that every opening sends)")
        ->type_name("N")
        ->check(Silent(CLI::Range(0, 255)));
    AddInstrumentOptions(command, options->instrument);
    AddJsonFlag(command, options->json);
    SetAction(command, session, options, Reset);
}

}  // namespace Varnholt::Cli
