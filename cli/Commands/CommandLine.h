#pragma once

#include <CLI/CLI.hpp>
#include <memory>

#include "Instrument.h"
#include "Session.h"

namespace Varnholt::Cli {

/// Makes `run` the session's action when `command` is what the user asked for. The options live as long as
/// the command line.
template <class Options>
void SetAction(CLI::App* command, Session& session, const std::shared_ptr<Options>& options,
               void (*run)(Session& session, const Options& options)) {
    command->callback(
        [&session, options, run] { session.action = [&session, options, run] { run(session, *options); }; });
}

/// A check whose own words do not show up in the help: the option's text says it.
template <class Validator>
CLI::Validator Silent(Validator validator) {
    validator.description("");
    return validator;
}

/// --device and --transport.
void AddInstrumentOptions(CLI::App* command, InstrumentOptions& options);
void AddTransportOption(CLI::App* command, InstrumentOptions& options);
void AddJsonFlag(CLI::App* command, bool& json);

}  // namespace Varnholt::Cli
