#pragma once

#include <functional>
#include <iosfwd>
#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <span>
#include <string>

#include "DeviceDriver/Ostra/Transport.h"
#include "Failure.h"
#include "Interruption.h"
#include "LoggedDeviceFiles.h"
#include "Output/Plot.h"
#include "Output/Progress.h"
#include "Platform/InterruptibleDeviceFiles.h"
#include "Terminal.h"

namespace Varnholt::Cli {

/// Where a run of the tool reads and writes. Results go to `out`, everything else to `err`; but the lines of
/// --verbose go to `log`, since they come from any thread, one at a time.
struct Surroundings {
    std::ostream& out;
    std::ostream& err;
    std::ostream& log;
    StreamFacts outFacts;
    StreamFacts errFacts;
    /// How long a pipe that is read may bring nothing.
    std::uint32_t inputPatience = 30'000;  // milliseconds
};

class TrafficRecording;

/// One run of the tool, as its commands see it. Its device files are in force once its action is carried out.
class Session final {
  public:
    /// References must outlive the session.
    Session(Surroundings& surroundings, Interruption& userInterruption);
    ~Session();
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;

    /// For results: standard output, or standard error once `ClaimOut` was called.
    std::ostream& Out() { return outIsClaimed_ ? where_.err : where_.out; }
    const StreamFacts& OutFacts() const { return where_.outFacts; }
    void Print(const nlohmann::ordered_json& value);
    /// What is in `Out` is on its way; throws where it cannot be written.
    void FlushOut();

    /// Standard output carries the bytes of a file from now on. Throws where it is a terminal.
    void ClaimOut();
    /// Bytes for standard output, on their way when this returns; throws where it cannot be written.
    void WriteClaimedOut(std::span<const std::uint8_t> content);
    /// Standard input is read as a file. Throws where that has happened already.
    void ClaimIn();
    std::uint32_t InputPatience() const { return where_.inputPatience; }

    /// Messages, on standard error.
    void Note(const std::string& text);
    void Warn(const std::string& text);
    void Report(const FailureReport& report);
    Progress MakeProgress(const std::string& title, std::uint64_t total, const std::string& unit);

    PlotStyle StyleOfPlots() const;

    Interruption& UserInterruption() { return interruption_; }
    /// For the action.
    Platform::InterruptibleDeviceFiles& Files() { return *files_; }
    /// The recording that is asked for begins: everything is known to be right, and an instrument about to be
    /// opened.
    void BeginRecording();

    /// "native", "usbio", or empty: that of this host.
    void ChooseTransport(const std::string& name);
    bool IsTransportChosen() const { return chosenTransport_.has_value(); }
    DeviceDriver::Ostra::Transport UsedTransport() const {
        return chosenTransport_ ? *chosenTransport_ : DeviceDriver::Ostra::HostTransport();
    }

    /// Sorts the failure of a command, with what is known of the instrument that it worked on.
    FailureReport Explain(const std::exception_ptr& failure) const;
    void SetInstrumentInUse(const std::string& identifier) { instrumentInUse_ = identifier; }

    /// What the command line asks for.
    std::function<void()> action;
    std::string captureFile;  ///< for the USB traffic; empty: it is not recorded
    bool verbose = false;     ///< commands and transfers are told on standard error
    /// Does it, when the command line has been understood as a whole.
    void CarryOut();

  private:
    std::string Paint(const char* color, const std::string& text) const;

    Surroundings& where_;
    Interruption& interruption_;
    std::unique_ptr<TrafficRecording> recording_;
    std::optional<LoggedDeviceFiles> loggedFiles_;             // stand on those of the recording
    std::optional<Platform::InterruptibleDeviceFiles> files_;  // stand on those before
    std::optional<Platform::ScopedDeviceFiles> filesInForce_;
    std::optional<DeviceDriver::Ostra::Transport> chosenTransport_;
    std::string instrumentInUse_;
    bool outIsClaimed_ = false;
    bool inIsClaimed_ = false;
};

}  // namespace Varnholt::Cli
