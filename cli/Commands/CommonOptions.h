#pragma once

#include <memory>

#include "CommandSpec.h"
#include "Service/Instruments.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Which instrument a command works on, and how it reaches it.
struct InstrumentOptions {
    std::string device;     ///< identifier or the end of one, or "chip:" and a chip id; empty: the first
    std::string transport;  ///< "native", "usbio" or empty
};

/// What happens when several instruments are connected and none is named.
enum class Choice {
    FirstWillDo,  ///< the first is taken, with a note
    MustBeNamed,  ///< refused: what follows changes the instrument
};
/// Over the transport that the options name, which is then the session's.
Service::FoundInstrument ChooseInstrument(Session& session, const InstrumentOptions& options,
                                          Choice choice = Choice::FirstWillDo);

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
