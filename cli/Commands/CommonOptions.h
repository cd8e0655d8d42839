#pragma once

#include <memory>

#include "CommandSpec.h"
#include "Instrument.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Makes `run` the session's action when `command` is what the user asked for. The options live as long as
/// the command line.
template <class Options>
void SetAction(CommandSpec command, Session& session, const std::shared_ptr<Options>& options,
               void (*run)(Session& session, const Options& options)) {
    command.WhenChosen(
        [&session, options, run] { session.action = [&session, options, run] { run(session, *options); }; });
}

/// --device and --transport.
void AddInstrumentOptions(CommandSpec command, InstrumentOptions& options);
void AddTransportOption(CommandSpec command, InstrumentOptions& options);
void AddJsonFlag(CommandSpec command, bool& json);

}  // namespace Varnholt::Cli
