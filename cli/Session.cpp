#include "Session.h"

#include <algorithm>
#include <ostream>

#include "Output/Json.h"
#include "Output/ProgressLine.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {
namespace {

constexpr const char* Red = "1;31";
constexpr const char* Yellow = "1;33";
constexpr const char* Name = "ostra: ";
constexpr const char* AdviceIndent = "       ";
constexpr int WidestPlot = 120;

}  // namespace

Session::Session(Streams& streams, Service::Interruption& userInterruption)
    : streams_(streams), interruption_(userInterruption) {}

Session::~Session() = default;

void Session::CarryOut() {
    if (!captureFile.empty()) {
        recording_ = RecordTraffic(captureFile);
    }
    Service::InterruptibleDeviceFiles::Log log;
    if (verbose) {
        log = [this](const std::string& line) { streams_.log << Name + line + '\n'; };
    }
    files_.emplace(Platform::DeviceFiles(), std::move(log));
    filesInForce_.emplace(*files_);
    context_.emplace(*this, interruption_, *files_);
    interruption_.ThrowIfRequested();  // one that came before
    action();
    FlushOut();
    if (recording_) {
        recording_->Check();
    }
}

void Session::Opening() {
    if (recording_) {
        recording_->Begin();
    }
}

std::string Session::Paint(const char* color, const std::string& text) const {
    return streams_.errFacts.showsColor ? "\x1b[" + std::string(color) + "m" + text + "\x1b[0m" : text;
}

void Session::Print(const Json& value) {
    Out() << value.Text();
}

void Session::Print(bool asJson, const Json& value, const std::string& text) {
    Out() << (asJson ? value.Text() : text);
}

void Session::FlushOut() {
    streams_.out.flush();
    if (!streams_.out) {
        interruption_.ThrowIfRequested();
        throw Failure(FailureKind::File, "the output cannot be written");
    }
}

void Session::ClaimOut() {
    if (streams_.outFacts.isTerminal) {
        throw Failure(FailureKind::BadArgument, "raw bytes are no use on a terminal",
                      "write them to a file, or into a pipe");
    }
    SetStandardOutputBinary();
    outIsClaimed_ = true;
}

void Session::WriteClaimedOut(std::span<const std::uint8_t> content) {
    streams_.out.write(reinterpret_cast<const char*>(content.data()),
                       static_cast<std::streamsize>(content.size()));
    FlushOut();
}

void Session::ClaimIn() {
    if (inIsClaimed_) {
        throw Failure(FailureKind::BadArgument, "standard input can be only one file",
                      "give the other one a name");
    }
    inIsClaimed_ = true;
}

void Session::Note(const std::string& text) {
    streams_.err << Name << text << '\n';
}

void Session::Warn(const std::string& text) {
    streams_.err << Paint(Yellow, Name) << text << '\n';
}

void Session::Report(const Failure& failure) {
    streams_.err << Paint(Red, Name) << failure.what() << '\n';
    if (!failure.Advice().empty()) {
        streams_.err << AdviceIndent << failure.Advice() << '\n';
    }
}

std::unique_ptr<Service::Progress> Session::StartProgress(const std::string& title, std::uint64_t total,
                                                          const std::string& unit) {
    StreamFacts facts = streams_.errFacts;
    facts.isTerminal = facts.isTerminal && !verbose;
    return std::make_unique<ProgressLine>(streams_.err, facts, title, total, unit);
}

PlotStyle Session::StyleOfPlots() const {
    PlotStyle style;
    style.braille = streams_.outFacts.showsUtf8;
    style.width = std::min(streams_.outFacts.size().columns - 1, WidestPlot);
    return style;
}

void Session::ChooseTransport(const std::string& name) {
    using Transport = Service::Context::Transport;
    if (!name.empty()) {
        context_->ChooseTransport(name == "usbio" ? Transport::UsbIo : Transport::Native);
    }
}

Failure Session::Explain(const std::exception_ptr& exception) const {
    return context_ ? context_->Explain(exception) : Service::Describe(exception);
}

}  // namespace Varnholt::Cli
