#include "Session.h"

#include <algorithm>
#include <ostream>

#include "Instrument.h"
#include "Output/Json.h"
#include "SystemCommands.h"
#include "Utilities/Files/FileError.h"

namespace Varnholt::Cli {
namespace {

constexpr const char* Red = "1;31";
constexpr const char* Yellow = "1;33";
constexpr const char* Name = "ostra: ";
constexpr const char* AdviceIndent = "       ";
constexpr int WidestPlot = 120;

}  // namespace

Session::Session(Surroundings& surroundings, Interruption& userInterruption)
    : where_(surroundings), interruption_(userInterruption) {}

Session::~Session() {
    interruption_.SetAction({});
}

void Session::CarryOut() {
    if (!captureFile.empty()) {
        recording_ = RecordTraffic(captureFile);
    }
    if (verbose) {
        loggedFiles_.emplace(Platform::DeviceFiles(),
                             [this](const std::string& line) { where_.log << Name + line + '\n'; });
        files_.emplace(*loggedFiles_);
    } else {
        files_.emplace(Platform::DeviceFiles());
    }
    filesInForce_.emplace(*files_);
    interruption_.SetAction([this] { files_->Interrupt(); });
    interruption_.ThrowIfRequested();  // one that came before
    action();
    FlushOut();
    if (recording_) {
        recording_->Check();
    }
}

void Session::BeginRecording() {
    if (recording_) {
        recording_->Begin();
    }
}

std::string Session::Paint(const char* color, const std::string& text) const {
    return where_.errFacts.showsColor ? "\x1b[" + std::string(color) + "m" + text + "\x1b[0m" : text;
}

void Session::Print(const nlohmann::ordered_json& value) {
    PrintJson(Out(), value);
}

void Session::FlushOut() {
    where_.out.flush();
    if (!where_.out) {
        interruption_.ThrowIfRequested();
        throw ToolFailure(ExitCode::File, "the output cannot be written");
    }
}

void Session::ClaimOut() {
    if (where_.outFacts.isTerminal) {
        throw ToolFailure(ExitCode::Usage, "raw bytes are no use on a terminal",
                          "write them to a file, or into a pipe");
    }
    SetStandardOutputBinary();
    outIsClaimed_ = true;
}

void Session::WriteClaimedOut(std::span<const std::uint8_t> content) {
    where_.out.write(reinterpret_cast<const char*>(content.data()),
                     static_cast<std::streamsize>(content.size()));
    FlushOut();
}

void Session::ClaimIn() {
    if (inIsClaimed_) {
        throw ToolFailure(ExitCode::Usage, "standard input can be only one file",
                          "give the other one a name");
    }
    inIsClaimed_ = true;
}

void Session::Note(const std::string& text) {
    where_.err << Name << text << '\n';
}

void Session::Warn(const std::string& text) {
    where_.err << Paint(Yellow, Name) << text << '\n';
}

void Session::Report(const FailureReport& report) {
    where_.err << Paint(Red, Name) << report.message << '\n';
    if (!report.advice.empty()) {
        where_.err << AdviceIndent << report.advice << '\n';
    }
}

Progress Session::MakeProgress(const std::string& title, std::uint64_t total, const std::string& unit) {
    StreamFacts facts = where_.errFacts;
    facts.isTerminal = facts.isTerminal && !verbose;
    return {where_.err, facts, title, total, unit};
}

PlotStyle Session::StyleOfPlots() const {
    PlotStyle style;
    style.braille = where_.outFacts.showsUtf8;
    style.width = std::min(where_.outFacts.size().columns - 1, WidestPlot);
    return style;
}

void Session::ChooseTransport(const std::string& name) {
    using DeviceDriver::Ostra::Transport;
    if (!name.empty()) {
        chosenTransport_ = name == "usbio" ? Transport::UsbIo : Transport::Native;
    }
}

FailureReport Session::Explain(const std::exception_ptr& failure) const {
    FailureReport report = Describe(failure);
    bool isOwn = false;
    try {
        std::rethrow_exception(failure);
    } catch (const ToolFailure&) {
        isOwn = true;
    } catch (const Utilities::Files::FileError&) {
        isOwn = true;
    } catch (...) {  // the library's: its text says nothing of which instrument
    }
    if (!isOwn && interruption_.IsRequested()) {
        return {ExitCode::Interrupted, "interrupted", {}};
    }
    if (isOwn || instrumentInUse_.empty()) {
        return report;
    }
    if (report.code == ExitCode::InputOutput && !IsConnected(instrumentInUse_, UsedTransport())) {
        report = {ExitCode::NoInstrument, "unplugged (" + report.message + ")",
                  "plug it in again; `ostra list` shows whether it is found"};
    }
    report.message = instrumentInUse_ + ": " + report.message;
    return report;
}

}  // namespace Varnholt::Cli
