#pragma once

#include <functional>
#include <string>

/// What the tool asks of the system for itself; one source for each platform.
namespace Varnholt::Cli {

/// What an output stream is connected to.
struct StreamFacts {
    bool isTerminal = false;
    bool showsColor = false;  ///< a terminal, and the user has not set NO_COLOR
    bool showsUtf8 = false;   ///< also for a file or pipe: what the environment says of characters
    int columns = 80;
};
StreamFacts FactsOfStandardOutput();
StreamFacts FactsOfStandardError();

/// Standard output carries bytes from now on, without translation of line ends.
void SetStandardOutputBinary();

/// Returns when the file's content has reached the disk, as far as the system can tell. False on failure.
bool SyncToDisk(const std::string& path);

/// Ctrl-C and the signals that ask a process to end, turned into calls of a function on a thread of its own.
/// Made before any other thread, on the main thread. From the second signal on the process ends at once, as
/// it would without this.
class SignalWatch final {
  public:
    explicit SignalWatch(std::function<void()> whenAsked);
    ~SignalWatch();
    SignalWatch(const SignalWatch&) = delete;
    SignalWatch& operator=(const SignalWatch&) = delete;

  private:
    struct State;
    State* state;
};

}  // namespace Varnholt::Cli
