#pragma once

namespace CLI {
class App;
}

namespace Varnholt::Cli {

class Session;

/// Adds the commands that only this platform has.
void AddSystemCommands(CLI::App& app, Session& session);

/// Prints the devices that could be instruments, as a table or JSON (--candidates of the list command).
void PrintCandidates(Session& session, bool json);

}  // namespace Varnholt::Cli
