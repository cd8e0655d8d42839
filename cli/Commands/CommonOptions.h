#pragma once

#include <memory>

#include "CommandSpec.h"
#include "Service/OpenedInstrument.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Which instrument a command works on, how it reaches it, and how it prints what comes of it. The options of
/// a command derive from it.
struct InstrumentOptions {
    std::string device;     ///< identifier or the end of one, or "chip:" and a chip id; empty: the first
    std::string transport;  ///< "native", "usbio" or empty
    bool json = false;
};

/// What happens when several instruments are connected and none is named.
enum class Choice {
    FirstWillDo,  ///< the first is taken, with a note
    MustBeNamed,  ///< refused: what follows changes the instrument
};
/// Over the transport that the options name, which is then the session's.
Service::FoundInstrument ChooseInstrument(Session& session, const InstrumentOptions& options,
                                          Choice choice = Choice::FirstWillDo);
/// Chooses and opens it.
Service::OpenedInstrument OpenInstrument(Session& session, const InstrumentOptions& options,
                                         Choice choice = Choice::FirstWillDo);

/// A command and its options, which live as long as the command line.
template <class Options>
struct CommandWithOptions {
    CommandSpec command;
    Options& options;
};
/// Adds a command. `run`, with the options, is the session's action when it is what the user asked for.
template <class Options>
CommandWithOptions<Options> NewCommand(CommandSpec parent, Session& session, const char* name,
                                       const char* about, void (*run)(Session&, const Options&)) {
    const auto options = std::make_shared<Options>();
    CommandSpec command = parent.AddCommand(name, about);
    command.WhenChosen(
        [&session, options, run] { session.action = [&session, options, run] { run(session, *options); }; });
    return {command, *options};
}

void AddTransportOption(CommandSpec command, InstrumentOptions& options);
/// --device and --transport.
void AddInstrumentOptions(CommandSpec command, InstrumentOptions& options);
void AddJsonFlag(CommandSpec command, bool& json);
/// All three.
void AddCommonOptions(CommandSpec command, InstrumentOptions& options);

}  // namespace Varnholt::Cli
