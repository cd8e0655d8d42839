#pragma once

#include <functional>
#include <memory>
#include <string>

/// What the tool asks of the system for itself; one source for each platform.
namespace Varnholt::Cli {

/// To be called before anything is opened: what is printed never goes into a file that took a closed stream's
/// place, and output that nobody reads any more, or that has no room left, is a failure to write instead of
/// the end of the process.
void SecureStandardStreams();

/// A stream that a program finds open, by its number.
enum class Standard { Output = 1, Error = 2 };

struct TerminalSize {
    int columns = 80;
    int rows = 24;

    bool operator==(const TerminalSize&) const = default;
};

/// What an output stream is connected to.
struct StreamFacts {
    bool isTerminal = false;
    bool movesCursor = false;  ///< a terminal that can be drawn on: not TERM=dumb
    bool showsColor = false;   ///< a terminal, and the user has not set NO_COLOR
    bool showsUtf8 = false;    ///< also for a file or pipe: what the environment says of characters
    /// To be asked each time: a window changes its size.
    std::function<TerminalSize()> size = [] { return TerminalSize{}; };
};
StreamFacts FactsOf(Standard stream);

/// Standard output carries bytes from now on, without translation of line ends.
void SetStandardOutputBinary();

/// A file's name as a command line takes it, whatever it begins with and holds.
std::string QuotedFileName(const std::string& name);

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
    const std::unique_ptr<State> state_;
};

}  // namespace Varnholt::Cli
