#pragma once

#include <functional>
#include <iosfwd>
#include <memory>
#include <optional>
#include <span>
#include <string>

#include "ExitCode.h"
#include "Output/Plot.h"
#include "Service/Context.h"
#include "Terminal.h"

namespace Varnholt::Cli {

/// Where a run of the tool reads and writes. Results go to `out`, everything else to `err`; but the lines of
/// --verbose go to `log`, since they come from any thread, one at a time.
struct Streams {
    std::ostream& out;
    std::ostream& err;
    std::ostream& log;
    StreamFacts outFacts;
    StreamFacts errFacts;
    /// How long a pipe that is read may bring nothing.
    std::uint32_t inputPatience = 30'000;  // milliseconds
};

class Json;
class TrafficRecording;

/// One run of the tool, as its commands see it. Its device files are in force once its action is carried out.
class Session final : public Service::Observer {
  public:
    /// References must outlive the session.
    Session(Streams& streams, Service::Interruption& userInterruption);
    ~Session() override;
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;

    /// For results: standard output, or standard error once `ClaimOut` was called.
    std::ostream& Out() { return outIsClaimed_ ? streams_.err : streams_.out; }
    const StreamFacts& OutFacts() const { return streams_.outFacts; }
    void Print(const Json& value);
    /// A result that has both forms.
    void Print(bool asJson, const Json& value, const std::string& text);
    /// What is in `Out` is on its way; throws where it cannot be written.
    void FlushOut();

    /// Standard output carries the bytes of a file from now on. Throws where it is a terminal.
    void ClaimOut();
    /// Bytes for standard output, on their way when this returns; throws where it cannot be written.
    void WriteClaimedOut(std::span<const std::uint8_t> content);
    /// Standard input is read as a file. Throws where that has happened already.
    void ClaimIn();
    std::uint32_t InputPatience() const { return streams_.inputPatience; }

    /// Messages, on standard error.
    void Note(const std::string& text) override;
    void Warn(const std::string& text);
    void Report(const Failure& failure);
    std::unique_ptr<Service::Progress> StartProgress(const std::string& title, std::uint64_t total,
                                                     const std::string& unit) override;
    /// The recording that is asked for begins.
    void Opening() override;

    PlotStyle StyleOfPlots() const;

    Service::Interruption& UserInterruption() { return interruption_; }
    /// In which the action uses instruments.
    Service::Context& Context() { return *context_; }
    /// "native", "usbio", or empty: that of this host. For the action.
    void ChooseTransport(const std::string& name);

    /// Sorts the failure of a command.
    Failure Explain(const std::exception_ptr& exception) const;

    /// What the command line asks for.
    std::function<void()> action;
    std::string captureFile;  ///< for the USB traffic; empty: it is not recorded
    bool verbose = false;     ///< commands and transfers are told on standard error
    /// Does it, when the command line has been understood as a whole.
    void CarryOut();

  private:
    std::string Paint(const char* color, const std::string& text) const;

    Streams& streams_;
    Service::Interruption& interruption_;
    std::unique_ptr<TrafficRecording> recording_;
    std::optional<Service::InterruptibleDeviceFiles> files_;  // stand on the recording's
    std::optional<Platform::ScopedDeviceFiles> filesInForce_;
    std::optional<Service::Context> context_;
    bool outIsClaimed_ = false;
    bool inIsClaimed_ = false;
};

}  // namespace Varnholt::Cli
