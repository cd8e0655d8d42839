#pragma once

#include <memory>
#include <string>

#include "CommandSpec.h"

namespace Varnholt::Cli {

class Session;

/// Adds the commands that only this platform has.
void AddSystemCommands(CommandSpec app, Session& session);

/// Prints the devices that could be instruments, as a table or JSON (--candidates of the list command).
void PrintCandidates(Session& session, bool json);

/// Records the USB traffic of the instruments in a pcapng file. The object's device files are in force for
/// its life.
class TrafficRecording {
  public:
    virtual ~TrafficRecording() = default;
    /// Makes the file, or empties the one that is there; once, however often it is called. Before that
    /// nothing is recorded. Throws `Failure`.
    virtual void Begin() = 0;
    /// Throws `Failure` when something could not be written.
    virtual void Check() const = 0;
};
std::unique_ptr<TrafficRecording> RecordTraffic(const std::string& file);

}  // namespace Varnholt::Cli
